// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/Runtrace.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {

// A trace service that calls back as the test says: at once, later on the test's clock, twice, never, or with
// errors. By default it starts and completes at once.
//
//   runtrace.onStart({MemoryRuntrace::didStart().after(14s)});
//   runtrace.onStop({MemoryRuntrace::didStop(), MemoryRuntrace::didComplete("/traces/1")});
//   runtrace.onStop({});                     // never
//   runtrace.callBack(0, MemoryRuntrace::didStart("broken"));  // the first session's delegate, now
//
// One thread. Callbacks run inside the call that causes them, or while the clock moves.
class MemoryRuntrace final : public Runtrace, private ManualClock::Alarm {
 public:
  struct Callback {
    enum class Kind { kDidStart, kDidStop, kDidComplete };
    Kind kind;
    RuntraceError error;
    std::string location;
    std::chrono::nanoseconds delay{0};

    Callback after(std::chrono::nanoseconds time) const {
      Callback later = *this;
      later.delay = time;
      return later;
    }
  };
  using Callbacks = std::vector<Callback>;

  static Callback didStart(RuntraceError error = {});
  static Callback didStop(RuntraceError error = {});
  static Callback didComplete(std::string location);
  static Callback didFailToComplete(std::string error);

  // `clock` outlives this.
  explicit MemoryRuntrace(ManualClock& clock);
  MemoryRuntrace(const MemoryRuntrace&) = delete;
  MemoryRuntrace& operator=(const MemoryRuntrace&) = delete;
  ~MemoryRuntrace() override;

  [[nodiscard]] std::shared_ptr<RuntraceSession> makeSession(
      const RuntraceConfiguration& configuration) override;

  // Set the callbacks of later starts and stops.
  void onStart(Callbacks callbacks) { onStart_ = std::move(callbacks); }
  void onStop(Callbacks callbacks) { onStop_ = std::move(callbacks); }

  // Calls the delegate of the session with index `at`, also when the session is gone. Returns false when
  // there is no delegate to call.
  bool callBack(std::size_t at, const Callback& callback);

  // Records what happened to a session.
  struct Record {
    RuntraceConfiguration configuration;
    std::weak_ptr<RuntraceSessionDelegate> delegate;
    int starts = 0;
    int stops = 0;
    bool isValid = true;
    bool isAlive = true;
    std::weak_ptr<void> token;  // passed with the completion; expired when nobody keeps the trace
  };
  std::size_t count() const { return records_.size(); }
  const Record& record(std::size_t at) const { return *records_.at(at); }

 private:
  class MemorySession;
  struct Pending {
    std::chrono::nanoseconds due;
    std::shared_ptr<Record> record;
    Callback callback;
  };

  std::optional<std::chrono::nanoseconds> nextDue() const override;
  void runNext() override;
  void schedule(const std::shared_ptr<Record>& record, const Callbacks& callbacks);
  static bool call(Record& record, const Callback& callback);

  ManualClock& clock_;
  Callbacks onStart_;
  Callbacks onStop_;
  std::vector<std::shared_ptr<Record>> records_;
  std::vector<Pending> pending_;  // sorted by due time; those with one time in the order of scheduling
};

}  // namespace tonewerk
