// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>

namespace tonewerk {

// Keeps a timer running. After it is destroyed no tick begins; a tick that is running on another thread may
// end after the destructor has returned. A tick may destroy its own timer.
class Timer {
 public:
  virtual ~Timer() = default;
};

// Makes repeating timers. All ticks run on one thread, which belongs to the service for its whole life.
class TimerService {
 public:
  virtual ~TimerService() = default;

  // Runs `tick` every `interval` on the timers' thread, for the first time after one interval. A tick that
  // takes longer than the interval delays the next one; missed ticks are skipped.
  [[nodiscard]] virtual std::unique_ptr<Timer> repeat(std::chrono::milliseconds interval,
                                                      std::function<void()> tick) = 0;
};

}  // namespace tonewerk
