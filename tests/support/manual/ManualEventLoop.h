// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <list>
#include <memory>

#include "bridges/pipewire/EventLoop.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {

// An event loop whose timers follow a clock that tests move, and that checks its descriptors when a test asks
// for it. It outlives the objects that it makes.
class ManualEventLoop final : public EventLoop, private ManualClock::Alarm {
 public:
  explicit ManualEventLoop(ManualClock& clock);
  ~ManualEventLoop() override;

  [[nodiscard]] std::unique_ptr<Source> watch(int descriptor, std::function<void()> onReadable) override;
  [[nodiscard]] std::unique_ptr<Timer> makeTimer(std::function<void()> onExpired) override;

  // Waits, at most some seconds, until a watched descriptor is readable, and runs its callback. Returns false
  // when none became readable.
  [[nodiscard]] bool runReadable();

 private:
  class ManualSource;
  class ManualTimer;

  std::optional<std::chrono::nanoseconds> nextDue() const override;
  void runNext() override;
  ManualTimer* earliest() const;

  ManualClock& clock_;
  std::list<ManualSource*> sources_;
  std::list<ManualTimer*> timers_;
};

}  // namespace tonewerk
