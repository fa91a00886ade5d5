// SPDX-License-Identifier: Apache-2.0
#include "support/manual/ManualTimers.h"

#include <cassert>

namespace tonewerk {

class ManualTimers::ManualTimer final : public Timer {
 public:
  explicit ManualTimer(std::shared_ptr<Entry> entry) : entry_(std::move(entry)) {}

 private:
  std::shared_ptr<Entry> entry_;
};

std::unique_ptr<Timer> ManualTimers::repeat(std::chrono::milliseconds interval, std::function<void()> tick) {
  assert(interval.count() > 0);
  auto entry = std::make_shared<Entry>(Entry{interval, clock_.monotonic() + interval, std::move(tick)});
  const MutexLock lock(mutex_);
  entries_.push_back(entry);
  return std::make_unique<ManualTimer>(std::move(entry));
}

std::size_t ManualTimers::count() const {
  const MutexLock lock(mutex_);
  std::size_t alive = 0;
  for (const auto& entry : entries_) alive += entry.expired() ? 0 : 1;
  return alive;
}

std::optional<std::chrono::nanoseconds> ManualTimers::nextDue() const {
  const MutexLock lock(mutex_);
  if (isTicking_) return std::nullopt;  // a tick moves the clock
  const std::shared_ptr<Entry> next = earliest();
  return next == nullptr ? std::nullopt : std::optional(next->due);
}

void ManualTimers::runNext() {
  std::shared_ptr<Entry> entry;  // keeps the tick alive while it runs, also when it destroys its timer
  {
    const MutexLock lock(mutex_);
    std::erase_if(entries_, [](const auto& held) { return held.expired(); });
    entry = earliest();
    if (entry == nullptr) return;
    // Missed ticks are skipped: the next one is the first that is still in the future.
    const std::chrono::nanoseconds late = clock_.monotonic() - entry->due;
    entry->due += entry->interval * (late / entry->interval + 1);
    isTicking_ = true;
  }
  entry->tick();
  const MutexLock lock(mutex_);
  isTicking_ = false;
}

std::shared_ptr<ManualTimers::Entry> ManualTimers::earliest() const {
  std::shared_ptr<Entry> next;
  for (const auto& held : entries_) {
    std::shared_ptr<Entry> entry = held.lock();
    if (entry != nullptr && (next == nullptr || entry->due < next->due)) next = std::move(entry);
  }
  return next;
}

}  // namespace tonewerk
