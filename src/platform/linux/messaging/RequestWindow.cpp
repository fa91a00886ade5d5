// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/RequestWindow.h"

#include <cassert>
#include <utility>

#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {

namespace {

thread_local RequestWindow* batchedWindow = nullptr;

}  // namespace

RequestWindow::Batch::Batch(RequestWindow& window) {
  assert(batchedWindow == nullptr);
  batchedWindow = &window;
}

RequestWindow::Batch::~Batch() {
  RequestWindow& window = *std::exchange(batchedWindow, nullptr);
  const std::uint64_t requests = std::exchange(window.batchedRequests_, 0);
  const std::uint64_t bytes = std::exchange(window.batchedBytes_, 0);
  if (requests > 0) window.finished(requests, bytes);
}

void RequestWindow::finished(std::size_t bytes) {
  if (batchedWindow != this) return finished(1, bytes);
  ++batchedRequests_;
  batchedBytes_ += bytes;
}

void RequestWindow::finished(std::uint64_t requests, std::uint64_t bytes) {
  finishedBytes_.fetch_add(bytes);
  // Both functions use sequentially consistent atomics: either this thread sees the count that hasRoom()
  // waits for, or hasRoom() sees this request's end.
  const std::uint64_t before = finishedRequests_.fetch_add(requests);
  const std::uint64_t awaited = wakeAt_.load();
  if (before < awaited && awaited <= before + requests) waker_->wake(connection_);
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
