// SPDX-License-Identifier: Apache-2.0
#include "support/manual/ManualEventLoop.h"

#include <optional>
#include <poll.h>
#include <utility>
#include <vector>

namespace tonewerk {

namespace {
constexpr int kPatienceMilliseconds = 20'000;
}

class ManualEventLoop::ManualSource final : public Source {
 public:
  ManualSource(ManualEventLoop& loop, int watched, std::function<void()> onReadable)
      : descriptor(watched),
        callback(std::make_shared<std::function<void()>>(std::move(onReadable))),
        loop_(loop) {
    loop_.sources_.push_back(this);
  }
  ~ManualSource() override { loop_.sources_.remove(this); }

  const int descriptor;
  const std::shared_ptr<std::function<void()>> callback;

 private:
  ManualEventLoop& loop_;
};

class ManualEventLoop::ManualTimer final : public Timer {
 public:
  ManualTimer(ManualEventLoop& loop, std::function<void()> onExpired)
      : callback(std::make_shared<std::function<void()>>(std::move(onExpired))), loop_(loop) {
    loop_.timers_.push_back(this);
  }
  ~ManualTimer() override { loop_.timers_.remove(this); }

  void arm(std::chrono::nanoseconds delay) override {
    due = loop_.clock_.monotonic() + std::max(delay, std::chrono::nanoseconds(0));
  }
  void disarm() override { due.reset(); }

  const std::shared_ptr<std::function<void()>> callback;
  std::optional<std::chrono::nanoseconds> due;

 private:
  ManualEventLoop& loop_;
};

ManualEventLoop::ManualEventLoop(ManualClock& clock) : clock_(clock) { clock_.addAlarm(*this); }

ManualEventLoop::~ManualEventLoop() { clock_.removeAlarm(*this); }

std::unique_ptr<EventLoop::Source> ManualEventLoop::watch(int descriptor, std::function<void()> onReadable) {
  return std::make_unique<ManualSource>(*this, descriptor, std::move(onReadable));
}

std::unique_ptr<EventLoop::Timer> ManualEventLoop::makeTimer(std::function<void()> onExpired) {
  return std::make_unique<ManualTimer>(*this, std::move(onExpired));
}

bool ManualEventLoop::runReadable() {
  std::vector<pollfd> descriptors;
  for (const ManualSource* source : sources_) descriptors.push_back({source->descriptor, POLLIN, 0});
  if (descriptors.empty() || poll(descriptors.data(), descriptors.size(), kPatienceMilliseconds) <= 0)
    return false;
  for (const pollfd& ready : descriptors) {
    if (ready.revents == 0) continue;
    for (const ManualSource* source : sources_) {
      if (source->descriptor != ready.fd) continue;
      const auto callback = source->callback;
      (*callback)();
      return true;
    }
  }
  return false;
}

std::optional<std::chrono::nanoseconds> ManualEventLoop::nextDue() const {
  const ManualTimer* timer = earliest();
  return timer == nullptr ? std::nullopt : timer->due;
}

void ManualEventLoop::runNext() {
  ManualTimer* timer = earliest();
  timer->due.reset();
  const auto callback = timer->callback;
  (*callback)();
}

ManualEventLoop::ManualTimer* ManualEventLoop::earliest() const {
  ManualTimer* earliest = nullptr;
  for (ManualTimer* timer : timers_) {
    if (timer->due && (earliest == nullptr || *timer->due < *earliest->due)) earliest = timer;
  }
  return earliest;
}

}  // namespace tonewerk
