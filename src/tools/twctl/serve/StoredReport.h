// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <stop_token>
#include <string>
#include <thread>

#include "values/Mutex.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Keeps what the store says, and reads it again on a thread of its own when the store has changed. Any
// thread.
class StoredReport {
 public:
  // One state of the store.
  struct Reading {
    std::uint64_t number = 0;  // grows with each reading
    ValueMap data;             // for the page, see ReportData
    ValueMap running;          // see ReportData
    std::string problem;       // why the last reading failed; `data` are then older. Empty on success
  };
  struct Source {
    // Reads the store. A problem is in Reading::problem. When the stop is requested, nobody needs the
    // reading.
    std::function<Reading(const std::stop_token& stop)> read;
    // Differs whenever the store has changed.
    std::function<std::string()> stamp;
  };

  // The pause between two readings: this, and so many times as long as the last one took. So a large store
  // does not keep a processor busy.
  static constexpr std::chrono::milliseconds kPause{1000};
  static constexpr int kPauseFactor = 4;

  explicit StoredReport(Source source) : source_(std::move(source)) {}
  StoredReport(const StoredReport&) = delete;
  StoredReport& operator=(const StoredReport&) = delete;
  ~StoredReport();

  // Reads the store now. To be called once, before start(). Returns the problem, empty on success.
  [[nodiscard]] std::string readFirst();
  // Begins to read it again on the thread.
  void start();

  // Has the store read again soon if it has changed. Does not wait.
  void refresh();
  // The newest state. Does not wait for a reading.
  [[nodiscard]] std::shared_ptr<const Reading> newest() const;

 private:
  using Clock = std::chrono::steady_clock;

  void run();
  void readIfChanged();

  const Source source_;
  std::string stamp_;  // of the newest reading; used by the reading thread
  mutable Mutex mutex_;
  Condition changed_;
  std::shared_ptr<const Reading> newest_ GUARDED_BY(mutex_);
  bool isWanted_ GUARDED_BY(mutex_) = false;
  bool ends_ GUARDED_BY(mutex_) = false;
  std::stop_source stop_;
  std::thread thread_;
};

}  // namespace tonewerk
