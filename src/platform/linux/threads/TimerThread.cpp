// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/TimerThread.h"

#include <algorithm>
#include <cassert>
#include <vector>

#include "platform/linux/threads/ThreadProperties.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

using MonotonicTime = std::chrono::steady_clock::time_point;

struct Entry {
  std::chrono::milliseconds interval;
  MonotonicTime due;  // read and written with Schedule::mutex held
  std::function<void()> tick;
};

}  // namespace

struct TimerThread::Schedule {
  Mutex mutex;
  std::vector<std::shared_ptr<Entry>> entries GUARDED_BY(mutex);
  bool isEnding GUARDED_BY(mutex) = false;
  Condition changed;

  void add(std::shared_ptr<Entry> entry) {
    {
      const MutexLock lock(mutex);
      entries.push_back(std::move(entry));
    }
    changed.notifyOne();
  }

  // Does not wake the thread, which notices when it would have run the tick.
  void remove(const std::shared_ptr<Entry>& entry) {
    const MutexLock lock(mutex);
    std::erase(entries, entry);
  }

  void end() {
    {
      const MutexLock lock(mutex);
      isEnding = true;
    }
    changed.notifyOne();
  }

  // Waits for the next tick that is due and sets the time of the one after it. Null when the service ends.
  std::shared_ptr<Entry> waitForDue() {
    MutexLock lock(mutex);
    for (;;) {
      if (isEnding) return nullptr;
      const auto next = std::min_element(entries.begin(), entries.end(),
                                         [](const auto& a, const auto& b) { return a->due < b->due; });
      if (next == entries.end()) {
        changed.wait(lock);
        continue;
      }
      std::shared_ptr<Entry> entry = *next;
      const MonotonicTime now = std::chrono::steady_clock::now();
      if (entry->due > now) {
        const MonotonicTime until = entry->due;
        entry.reset();  // so that the tick is freed if its timer is destroyed meanwhile
        static_cast<void>(changed.waitUntil(lock, until));  // the loop looks at the time itself
        continue;
      }
      // Missed ticks are dropped: the next tick is the first one in the future.
      entry->due += entry->interval * ((now - entry->due) / entry->interval + 1);
      return entry;
    }
  }

  void run() {
    nameThisThread("timers");
    while (const std::shared_ptr<Entry> entry = waitForDue()) entry->tick();
  }
};

class TimerThread::ScheduledTimer final : public Timer {
 public:
  ScheduledTimer(std::shared_ptr<Schedule> schedule, std::shared_ptr<Entry> entry)
      : schedule_(std::move(schedule)), entry_(std::move(entry)) {}
  ScheduledTimer(const ScheduledTimer&) = delete;
  ScheduledTimer& operator=(const ScheduledTimer&) = delete;
  ~ScheduledTimer() override { schedule_->remove(entry_); }

 private:
  std::shared_ptr<Schedule> schedule_;
  std::shared_ptr<Entry> entry_;
};

TimerThread::TimerThread()
    : schedule_(std::make_shared<Schedule>()), thread_([schedule = schedule_] { schedule->run(); }) {}

TimerThread::~TimerThread() {
  assert(std::this_thread::get_id() != thread_.get_id());
  schedule_->end();
  thread_.join();
}

std::unique_ptr<Timer> TimerThread::repeat(std::chrono::milliseconds interval, std::function<void()> tick) {
  assert(interval.count() > 0);
  auto entry =
      std::make_shared<Entry>(Entry{interval, std::chrono::steady_clock::now() + interval, std::move(tick)});
  schedule_->add(entry);
  return std::make_unique<ScheduledTimer>(schedule_, std::move(entry));
}

}  // namespace tonewerk
