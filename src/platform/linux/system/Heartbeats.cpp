// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/Heartbeats.h"

#include <utility>

#include "platform/Log.h"

namespace tonewerk {
namespace {

constexpr int kLooksUntilLogged = 2;

}  // namespace

void Heartbeats::watch(std::string name, std::shared_ptr<const Heartbeat> heartbeat) {
  const MutexLock lock(mutex_);
  watched_.push_back({std::move(name), std::move(heartbeat)});
}

// Looks at each of them, also after one that is not alive.
bool Heartbeats::areAlive(std::chrono::nanoseconds now, std::chrono::nanoseconds limit) {
  const MutexLock lock(mutex_);
  bool areAlive = true;
  for (Watched& watched : watched_) areAlive = isAlive(watched, now, limit) && areAlive;
  return areAlive;
}

bool Heartbeats::isAlive(Watched& watched, std::chrono::nanoseconds now,
                         std::chrono::nanoseconds limit) const {
  const Heartbeat::Reading reading = watched.heartbeat->read();
  const bool hasMoved = watched.movedAt.count() < 0 || reading.beats != watched.beats;
  if (hasMoved || !reading.isWorking) {
    watched.beats = reading.beats;
    watched.movedAt = now;
    if (std::exchange(watched.failedLooks, 0) >= kLooksUntilLogged) {
      errorLog(log_, "%@ makes progress again", watched.name);
    }
    return true;
  }
  const std::chrono::nanoseconds still = now - watched.movedAt;
  if (still < limit + reading.allowance) return true;
  if (++watched.failedLooks == kLooksUntilLogged) {
    const long long seconds = std::chrono::duration_cast<std::chrono::seconds>(still).count();
    errorLog(log_, "%@ has made no progress for %lli s; the watchdog is told nothing until it does",
             watched.name, seconds);
  }
  return false;
}

}  // namespace tonewerk
