// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/CaptureSessions.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <utility>

#include "platform/Clock.h"
#include "platform/TimerService.h"

namespace tonewerk {
namespace {

// Rounded up, so that the timer never fires early.
std::chrono::milliseconds intervalOf(double seconds) {
  const auto milliseconds = static_cast<std::int64_t>(std::ceil(seconds * 1000.0));
  return std::chrono::milliseconds(std::max<std::int64_t>(milliseconds, 1));
}

}  // namespace

CaptureSessions::CaptureSessions(const Clock& clock, TimerService& timers, CapturePolicy::Count count,
                                 Capture capture)
    : clock_(clock), timers_(timers), policy_(clock, count), capture_(std::move(capture)) {}

CaptureSessions::~CaptureSessions() = default;

CaptureSessions::Outcome CaptureSessions::snapshot(const CaptureRequest& request) {
  const MutexLock lock(mutex_);
  if (isFinished_) return {kFaultsignErrorServiceUnavailable};
  if (const FaultsignError error = policy_.judge(request.signature, request.duration)) return {error};
  std::string identifier = identifiers_.next(clock_.now());
  if (!capture_(identifier, request)) return {kFaultsignErrorServiceUnavailable};
  policy_.accept(request.signature);
  return {kFaultsignErrorNone, std::move(identifier)};
}

CaptureSessions::Outcome CaptureSessions::start(const CaptureRequest& request) {
  const MutexLock lock(mutex_);
  if (isFinished_) return {kFaultsignErrorServiceUnavailable};
  if (const FaultsignError error = policy_.judge(request.signature, request.duration)) return {error};
  if (pending_.size() >= kMaxPending) return {kFaultsignErrorServiceUnavailable};
  const CapturePolicy::Acceptance acceptance = policy_.accept(request.signature);
  std::string identifier = identifiers_.next(clock_.now());
  // The timer's callback waits for the lock. So it finds the entry even if it is due before the entry is
  // added.
  auto timer = timers_.repeat(intervalOf(request.duration), [weak = weak_from_this(), identifier] {
    if (const auto self = weak.lock()) self->fire(identifier);
  });
  pending_.emplace(identifier, Pending{request, acceptance, std::move(timer)});
  return {kFaultsignErrorNone, std::move(identifier)};
}

// Holds the lock until the capture is made, so that cancel() and finish() know whether it was made.
void CaptureSessions::fire(const std::string& identifier) {
  const MutexLock lock(mutex_);
  const auto due = pending_.find(identifier);
  if (due == pending_.end()) return;
  capture_(identifier, due->second.request);  // logs by itself if there is no room
  pending_.erase(due);
}

bool CaptureSessions::cancel(const std::string& identifier) {
  const MutexLock lock(mutex_);
  const auto found = pending_.find(identifier);
  if (found == pending_.end()) return false;
  policy_.withdraw(found->second.request.signature, found->second.acceptance);
  pending_.erase(found);
  return true;
}

std::vector<std::string> CaptureSessions::finish() {
  const MutexLock lock(mutex_);
  isFinished_ = true;
  std::vector<std::string> dropped;
  for (const auto& entry : pending_) dropped.push_back(entry.first);
  pending_.clear();
  return dropped;
}

CapturePolicy::Count CaptureSessions::count() const {
  const MutexLock lock(mutex_);
  return policy_.count();
}

}  // namespace tonewerk
