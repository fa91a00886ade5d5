// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>
#include <vector>

#include "platform/DaemonStatus.h"
#include "platform/Platform.h"
#include "platform/SinkStatus.h"

namespace tonewerk {

class Accounts;
class AllocatorReclaimer;
class DiagnosticsStore;
class LinuxCapsa;
struct Directories;
struct Tracing;

// Owns one of each adapter and makes the Platform out of them. It must outlive all users of the Platform.
//
// The adapters of the sinks are not included: the caller creates them with the clock, the log and the
// preferences of this object.
class LinuxPlatform {
 public:
  explicit LinuxPlatform(const Directories& directories);
  LinuxPlatform(const LinuxPlatform&) = delete;
  LinuxPlatform& operator=(const LinuxPlatform&) = delete;
  ~LinuxPlatform();

  Log& log();
  // How the log's queue stands.
  SinkStatus logStatus();
  // The last different error lines, newest first. Any thread.
  std::vector<LoggedTrouble> troubles() const;
  // Waits until all lines are written; false after `timeout`. For ends of the process that destroy nothing.
  [[nodiscard]] bool flushLog(std::chrono::milliseconds timeout);
  Accounts& accounts();
  Clock& clock();
  SerialQueueFactory& queues();
  TimerService& timers();
  PreferenceStore& preferences();
  JsonService& json();
  FileSystem& files();
  AllocatorReclaimer& memory();
  // At the daemon's end, call finish() of these two, in this order, while the users of the Platform still
  // exist.
  LinuxCapsa& capsa();
  DiagnosticsStore& diagnostics();

  // Reads preferences and device facts again now, so that later reads give their current values.
  void readConfigurationAgain();
  // Creates the adapters' directories in the runtime directory again. Call it after that was created again.
  void restoreRuntimeDirectory();

  // The arguments must outlive all users of the result.
  Platform platform(Clock& clock, Metricon& metricon, Energybook& energybook, Diagwire& diagwire,
                    LinkReport& linkReport, const Tracing& tracing, Journal& journal);

 private:
  struct Adapters;
  std::unique_ptr<Adapters> adapters_;
};

}  // namespace tonewerk
