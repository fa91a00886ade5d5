// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/RequestWindow.h"

#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {

void RequestWindow::finished(std::size_t bytes) {
  finishedBytes_.fetch_add(bytes);
  // Both functions use sequentially consistent atomics: either this thread sees the count that hasRoom()
  // waits for, or hasRoom() sees this request's end.
  if (finishedRequests_.fetch_add(1) + 1 == wakeAt_.load()) waker_->wake(connection_);
}

void RequestWindow::begin(std::size_t bytes) {
  ++startedRequests_;
  startedBytes_ += bytes;
}

InFlightToken RequestWindow::start(std::size_t bytes) {
  begin(bytes);
  return {shared_from_this(), bytes};
}

bool RequestWindow::isBelowBound(std::size_t otherBytes) const {
  return startedRequests_ - knownFinishedRequests_ < kMaxUnfinishedRequests &&
         startedBytes_ - knownFinishedBytes_ + otherBytes < kMaxUnfinishedBytes;
}

bool RequestWindow::hasRoom(std::size_t otherBytes) {
  while (!isBelowBound(otherBytes)) {
    knownFinishedRequests_ = finishedRequests_.load();
    knownFinishedBytes_ = finishedBytes_.load();
    if (isBelowBound(otherBytes)) return true;
    const std::uint64_t unfinished = startedRequests_ - knownFinishedRequests_;
    if (unfinished == 0)
      return false;  // the other bytes alone reach the bound, and this class does not count those
    const std::uint64_t awaited = knownFinishedRequests_ + (unfinished + 1) / 2;
    wakeAt_.store(awaited);
    if (finishedRequests_.load() < awaited) return false;
  }
  return true;
}

}  // namespace tonewerk
