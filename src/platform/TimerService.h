// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>

namespace tonewerk {

// A running timer. Destroying it invalidates it: no tick begins from then on; one that is running on another
// thread may still end after the destructor has returned. May be destroyed from inside its own tick.
class Timer {
 public:
  virtual ~Timer() = default;
};

// Repeating timers, all on one thread that belongs to them for the life of the service.
class TimerService {
 public:
  virtual ~TimerService() = default;

  // Runs `tick` every `interval` on the timers' thread, first after one interval. A tick that takes longer
  // than the interval delays the next one; missed ticks are not made up for.
  [[nodiscard]] virtual std::unique_ptr<Timer> repeat(std::chrono::milliseconds interval,
                                                      std::function<void()> tick) = 0;
};

}  // namespace tonewerk
