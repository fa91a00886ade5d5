// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineClock.h"

#include <algorithm>
#include <utility>

namespace tonewerk {

using std::chrono::nanoseconds;

double OfflineClock::now() const { return startsAt_ + std::chrono::duration<double>(monotonic()).count(); }

void OfflineClock::sleep(nanoseconds duration) {
  const nanoseconds end = monotonic() + std::max(duration, nanoseconds::zero());
  while (timers_ != nullptr && timers_->runNextUntil(end)) {
  }
  moveTo(end);
}

void OfflineClock::moveTo(nanoseconds time) { monotonic_ = std::max(monotonic(), time).count(); }

struct OfflineTimers::Entry {
  nanoseconds interval;
  nanoseconds due;
  std::function<void()> tick;
};

class OfflineTimers::OfflineTimer final : public Timer {
 public:
  explicit OfflineTimer(std::shared_ptr<Entry> entry) : entry_(std::move(entry)) {}

 private:
  const std::shared_ptr<Entry> entry_;
};

OfflineTimers::OfflineTimers(OfflineClock& clock) : clock_(clock) { clock_.timers_ = this; }

OfflineTimers::~OfflineTimers() { clock_.timers_ = nullptr; }

std::unique_ptr<Timer> OfflineTimers::repeat(std::chrono::milliseconds interval, std::function<void()> tick) {
  const nanoseconds step = std::max<nanoseconds>(interval, std::chrono::milliseconds(1));
  auto entry = std::make_shared<Entry>(Entry{step, clock_.monotonic() + step, std::move(tick)});
  std::erase_if(entries_, [](const auto& known) { return known.expired(); });
  entries_.push_back(entry);
  return std::make_unique<OfflineTimer>(std::move(entry));
}

bool OfflineTimers::runNextUntil(nanoseconds time) {
  std::shared_ptr<Entry> next;
  for (const std::weak_ptr<Entry>& known : entries_) {
    auto entry = known.lock();
    if (entry != nullptr && (next == nullptr || entry->due < next->due)) next = std::move(entry);
  }
  if (next == nullptr || next->due > time) {
    clock_.moveTo(time);
    return false;
  }
  clock_.moveTo(next->due);
  // Before the tick, which may itself move the clock.
  next->due += next->interval;
  const std::function<void()> tick = next->tick;  // it may destroy its own timer
  next.reset();
  tick();
  return true;
}

namespace {

class OfflineSemaphore final : public Semaphore {
 public:
  OfflineSemaphore(OfflineClock& clock, OfflineTimers& timers) : clock_(clock), timers_(timers) {}

  void signal() override { ++signals_; }
  [[nodiscard]] bool wait(nanoseconds timeout) override {
    const nanoseconds end = clock_.monotonic() + std::max(timeout, nanoseconds::zero());
    while (signals_ == 0 && timers_.runNextUntil(end)) {
    }
    if (signals_ == 0) return false;
    --signals_;
    return true;
  }

 private:
  OfflineClock& clock_;
  OfflineTimers& timers_;
  std::size_t signals_ = 0;
};

}  // namespace

std::unique_ptr<Semaphore> OfflineSemaphores::makeSemaphore() {
  return std::make_unique<OfflineSemaphore>(clock_, timers_);
}

}  // namespace tonewerk
