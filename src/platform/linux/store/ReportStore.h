// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreQueue.h"

namespace tonewerk {

class Clock;
class JsonService;
class LogCategory;
class PreferenceStore;

// The reports kept on the device: one SQLite file, written by one thread in batches at most 100 ms behind,
// readable by anybody at any time. docs/store.md says what is in it.
//
// Recording costs the caller a place in a bounded queue; JSON and SQL are the thread's. While the queue is
// full because more comes in than the disk takes, recording waits. While the file cannot be written (a full
// disk, a missing directory, a file of a newer version) or the disk hangs, recording does not wait: rows are
// kept while there is room and then dropped, and their number is logged when writing goes on, and at the end.
// A damaged file is moved aside.
//
// The bounds are preferences of the domain "com.orvane.tonewerk.store": "max_megabytes" (256) and "max_days"
// (30). They are read again every ten seconds while there is something to write, and when somebody asks for
// it; what is too old is deleted then.
class ReportStore {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.store";
  static constexpr std::string_view kMaxMegabytesKey = "max_megabytes";
  static constexpr std::string_view kMaxDaysKey = "max_days";

  using Limits = StoreQueue::Limits;

  // The file lies in `directory`, which is made when it is missing. Everything referred to outlives the
  // store.
  ReportStore(const std::string& directory, const JsonService& json, const PreferenceStore& preferences,
              const Clock& clock, const LogCategory& log, const Limits& limits = {});
  ReportStore(const ReportStore&) = delete;
  ReportStore& operator=(const ReportStore&) = delete;
  // Writes what is still to be written, if that goes well at the first try.
  ~ReportStore();

  // Any thread. `recordedAt` in seconds since 1970.
  void recordEvent(double recordedAt, EventNames names, ValueMap payload);
  // Any thread. A row of any table.
  void record(StoreRow row);

  // Any thread. The bounds are read again and kept to at once, also where there is nothing to write.
  void readBoundsAgain();

  // Any thread but the work of JsonService, preferences and log. Returns when everything recorded before is
  // in the file; false when it cannot be written or `timeout` passed.
  [[nodiscard]] bool flush(std::chrono::milliseconds timeout);

 private:
  // Keeps the preferences from being read for each batch.
  static constexpr std::chrono::seconds kBoundsInterval{10};
  static constexpr std::chrono::milliseconds kFirstBackOff{500};
  static constexpr std::chrono::milliseconds kLongestBackOff{30'000};

  void run();
  [[nodiscard]] bool writeUntilDone();
  [[nodiscard]] bool write();
  [[nodiscard]] StoreDatabase::Result writeOrBeginAnew();
  [[nodiscard]] bool moveAside();
  void trim();
  void readBounds();
  double bound(std::string_view key, double otherwise, std::string& wrong) const;
  void logFailure();
  void logSuccess(std::uint64_t dropped);

  const PreferenceStore& preferences_;
  const Clock& clock_;
  const LogCategory& log_;
  StoreQueue queue_;
  std::atomic<bool> areBoundsStale_ = true;

  // The thread's own.
  StoreDatabase database_;
  std::vector<StoreRow> batch_;
  StoreBounds bounds_;
  std::chrono::nanoseconds boundsReadAt_{0};
  bool ageDue_ = false;  // a look at the oldest rows is due
  bool moreToTrim_ = false;
  std::string loggedProblem_;  // empty while writing goes well
  std::string loggedTrimProblem_;
  std::string loggedWrongBounds_;

  std::thread thread_;
};

}  // namespace tonewerk
