// SPDX-License-Identifier: Apache-2.0
#include "platform/Heartbeat.h"

#include <algorithm>
#include <cassert>
#include <utility>

namespace tonewerk {
namespace {

thread_local const Heartbeat::OnThisThread* ofThread = nullptr;

}  // namespace

// The allowance is read first: a reader that sees that a long work has ended then also sees its last beat.
Heartbeat::Reading Heartbeat::read() const {
  Reading reading;
  reading.allowance = std::chrono::milliseconds(allowanceMilliseconds_.load(std::memory_order_acquire));
  const std::uint64_t state = state_.load(std::memory_order_acquire);
  reading.beats = state / kOneBeat;
  reading.isWorking = (state & kWorking) != 0;
  return reading;
}

void Heartbeat::beatHere() {
  if (ofThread != nullptr) ofThread->heartbeat_->beat();
}

std::shared_ptr<const Heartbeat> Heartbeat::ofThisThread() {
  return ofThread == nullptr ? nullptr : ofThread->heartbeat_;
}

Heartbeat::OnThisThread::OnThisThread(std::shared_ptr<Heartbeat> heartbeat)
    : heartbeat_(std::move(heartbeat)) {
  assert(ofThread == nullptr);
  ofThread = this;
}

Heartbeat::OnThisThread::~OnThisThread() {
  ofThread = nullptr;
  heartbeat_->rest();
}

Heartbeat::Rest::Rest() {
  if (ofThread != nullptr) ofThread->heartbeat_->rest();
}

Heartbeat::LongWork::LongWork(std::chrono::nanoseconds bound) {
  if (ofThread == nullptr) return;
  Heartbeat& heartbeat = *ofThread->heartbeat_;
  outerMilliseconds_ = heartbeat.allowanceMilliseconds_.load(std::memory_order_relaxed);
  const std::int64_t milliseconds = std::chrono::ceil<std::chrono::milliseconds>(bound).count();
  heartbeat.allowanceMilliseconds_.store(std::max(milliseconds, outerMilliseconds_),
                                         std::memory_order_relaxed);
  heartbeat.beat();
}

Heartbeat::LongWork::~LongWork() {
  if (ofThread == nullptr) return;
  Heartbeat& heartbeat = *ofThread->heartbeat_;
  heartbeat.beat();
  heartbeat.allowanceMilliseconds_.store(outerMilliseconds_, std::memory_order_release);
}

}  // namespace tonewerk
