// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>

namespace tonewerk {

// What the bridge's one thread waits for. Callbacks run on it, one at a time, never from inside a call to the
// loop.
class EventLoop {
 public:
  // Destroying it ends its callbacks; allowed from inside one.
  class Source {
   public:
    virtual ~Source() = default;
  };

  // Runs once for each arming. Stopped when made.
  class Timer {
   public:
    virtual ~Timer() = default;
    // After at least `delay`, of which a negative one is none. Replaces an earlier arming.
    virtual void arm(std::chrono::nanoseconds delay) = 0;
    virtual void disarm() = 0;
  };

  virtual ~EventLoop() = default;

  // Runs `onReadable` as long as `descriptor` has something to read, or its peer is gone. The descriptor
  // stays the caller's, who closes it after destroying the result. Null when the system refuses.
  [[nodiscard]] virtual std::unique_ptr<Source> watch(int descriptor, std::function<void()> onReadable) = 0;
  [[nodiscard]] virtual std::unique_ptr<Timer> makeTimer(std::function<void()> onExpired) = 0;
};

}  // namespace tonewerk
