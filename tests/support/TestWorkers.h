// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "session/TWReportingSessionWorkerClass.h"

namespace tonewerk {

// Records what test workers do, in order, such as "Volume started", "Capsa failed to start", "Rtc got a=1",
// "Rtc got a=1 redundant" or "Rtc stopped", and lets a test change what they do. At most one may exist at a
// time; without one, workers record nothing.
class TestWorkerJournal {
 public:
  TestWorkerJournal();
  TestWorkerJournal(const TestWorkerJournal&) = delete;
  TestWorkerJournal& operator=(const TestWorkerJournal&) = delete;
  ~TestWorkerJournal();

  // Returns the events since the last call.
  std::vector<std::string> take();
  // Runs `action` once, when `event` happens.
  void onEvent(const std::string& event, std::function<void()> action);
  void failStart(std::string_view workerName) { failingStart_ = workerName; }
  void failToMake(std::string_view workerName) { failingToMake_ = workerName; }

  // For the workers. Returns null without a journal.
  static TestWorkerJournal* current();
  void add(const std::string& event);
  bool startFails(std::string_view workerName) const { return failingStart_ == workerName; }
  bool makingFails(std::string_view workerName) const { return failingToMake_ == workerName; }

 private:
  std::vector<std::string> events_;
  std::map<std::string, std::function<void()>> actions_;
  std::string failingStart_;
  std::string failingToMake_;
};

// Returns sixteen classes with the roles and answers of the daemon's workers, in their order: Trace, Volume,
// Gather, Summary, Input, Metricon, Energybook, MemoryLog, Diagwire, DriverSnapshot, SystemMonitor, Capsa,
// DP, JsonFile, Rtc, IssueDraft.
std::vector<const TWReportingSessionWorkerClass*> testWorkerClasses();
std::vector<const TWReportingSessionWorkerClass*> testWorkerClassesWithoutStartOnInit();
const TWReportingSessionWorkerClass* testWorkerClass(std::string_view name);

}  // namespace tonewerk
