// SPDX-License-Identifier: Apache-2.0
#include "support/manual/ManualClock.h"

#include <algorithm>
#include <cassert>

namespace tonewerk {
namespace {

double secondsOf(std::chrono::nanoseconds duration) {
  return std::chrono::duration<double>(duration).count();
}

}  // namespace

double ManualClock::now() const {
  const MutexLock lock(mutex_);
  ++wallReads_;
  return wallAtZero_ + secondsOf(monotonic_);
}

std::chrono::nanoseconds ManualClock::monotonic() const {
  const MutexLock lock(mutex_);
  return monotonic_;
}

std::chrono::minutes ManualClock::utcOffset(double) const {
  const MutexLock lock(mutex_);
  return utcOffset_;
}

void ManualClock::sleep(std::chrono::nanoseconds duration) {
  if (duration.count() > 0) advance(duration);
}

void ManualClock::advance(std::chrono::nanoseconds duration) {
  (void)advanceUntil(duration, [] { return false; });  // nothing ends it early
}

bool ManualClock::advanceUntil(std::chrono::nanoseconds duration, const std::function<bool()>& isDone) {
  assert(duration.count() >= 0);
  const std::chrono::nanoseconds end = monotonic() + duration;
  if (isDone()) return true;
  while (Alarm* alarm = earliestUntil(end)) {
    // An alarm may have moved the clock beyond the time of the next one.
    moveTo(std::max(monotonic(), *alarm->nextDue()));
    alarm->runNext();
    if (isDone()) return true;
  }
  moveTo(std::max(monotonic(), end));
  return false;
}

void ManualClock::advance(double seconds) {
  advance(std::chrono::round<std::chrono::nanoseconds>(std::chrono::duration<double>(seconds)));
}

void ManualClock::setNow(double seconds) {
  const MutexLock lock(mutex_);
  wallAtZero_ = seconds - secondsOf(monotonic_);
}

void ManualClock::setUtcOffset(std::chrono::minutes offset) {
  const MutexLock lock(mutex_);
  utcOffset_ = offset;
}

std::uint64_t ManualClock::wallReads() const {
  const MutexLock lock(mutex_);
  return wallReads_;
}

void ManualClock::addAlarm(Alarm& alarm) { alarms_.push_back(&alarm); }
void ManualClock::removeAlarm(Alarm& alarm) { std::erase(alarms_, &alarm); }

ManualClock::Alarm* ManualClock::earliestUntil(std::chrono::nanoseconds end) const {
  Alarm* earliest = nullptr;
  std::chrono::nanoseconds due = end;
  for (Alarm* alarm : alarms_) {
    const auto next = alarm->nextDue();
    if (!next || *next > due || (earliest != nullptr && *next == due)) continue;
    earliest = alarm;
    due = *next;
  }
  return earliest;
}

void ManualClock::moveTo(std::chrono::nanoseconds monotonic) {
  const MutexLock lock(mutex_);
  monotonic_ = monotonic;
}

}  // namespace tonewerk
