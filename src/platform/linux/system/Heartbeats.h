// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "platform/Heartbeat.h"
#include "values/Mutex.h"

namespace tonewerk {

class LogCategory;

// The heartbeats of the threads without which the daemon serves nobody. Any thread.
class Heartbeats {
 public:
  // `log` outlives this object.
  explicit Heartbeats(const LogCategory& log) : log_(log) {}

  // From now on this thread is watched. `name` is for people: "the store".
  void watch(std::string name, std::shared_ptr<const Heartbeat> heartbeat);

  // Whether every watched thread rests, or has beaten within `limit`, or within `limit` and its allowance. A
  // thread has beaten at the time of the first call that saw the beat. `now` is monotonic.
  //
  // A thread that two calls in a row find without a beat is logged, once until it moves again. It is not
  // logged at the first call, because a process that was stopped for a while finds all its threads so.
  [[nodiscard]] bool areAlive(std::chrono::nanoseconds now, std::chrono::nanoseconds limit);

 private:
  struct Watched {
    std::string name;
    std::shared_ptr<const Heartbeat> heartbeat;
    std::uint64_t beats = 0;
    std::chrono::nanoseconds movedAt{-1};  // negative before the first look
    int failedLooks = 0;
  };

  [[nodiscard]] bool isAlive(Watched& watched, std::chrono::nanoseconds now,
                             std::chrono::nanoseconds limit) const;

  const LogCategory& log_;
  Mutex mutex_;
  std::vector<Watched> watched_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
