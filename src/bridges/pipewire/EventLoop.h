// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>

namespace tonewerk {

// Watches descriptors and timers for the bridge's one thread. Callbacks run on that thread, one at a time,
// never from inside a call to the loop.
class EventLoop {
 public:
  // Destroying it ends its callbacks, and is allowed from inside one of them.
  class Source {
   public:
    virtual ~Source() = default;
  };

  // Runs its callback once after arm(), unless disarm() or another arm() comes first. A new timer is stopped.
  class Timer {
   public:
    virtual ~Timer() = default;
    // Runs the callback after at least `delay`; a negative delay counts as 0. Replaces an earlier arm().
    virtual void arm(std::chrono::nanoseconds delay) = 0;
    virtual void disarm() = 0;
  };

  virtual ~EventLoop() = default;

  // Runs `onReadable` as long as `descriptor` has something to read or its peer is gone. The caller keeps the
  // descriptor and closes it after destroying the result. Null when the system refuses.
  [[nodiscard]] virtual std::unique_ptr<Source> watch(int descriptor, std::function<void()> onReadable) = 0;
  [[nodiscard]] virtual std::unique_ptr<Timer> makeTimer(std::function<void()> onExpired) = 0;
};

}  // namespace tonewerk
