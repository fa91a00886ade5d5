// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>

#include "platform/RequestHandler.h"
#include "platform/linux/threads/IoWaker.h"

namespace tonewerk {

// How many of a connection's requests are under way, and how many bytes they hold.
//
// The I/O thread counts what it starts, whoever finishes a request counts that; so the I/O thread only looks
// at the others' counters when its own idea of them says that the bound is reached.
class RequestWindow final : public InFlightCounter, public std::enable_shared_from_this<RequestWindow> {
 public:
  RequestWindow(std::shared_ptr<IoWaker> waker, std::uint64_t connection)
      : waker_(std::move(waker)), connection_(connection) {}

  // Any thread.
  void finished(std::size_t bytes) override;

  // The I/O thread: a request begins, and has ended when the token is gone.
  [[nodiscard]] InFlightToken start(std::size_t bytes);

  // The I/O thread: whether there is room for another request beside `otherBytes` that the connection holds.
  // When there is none, the connection is woken once half of the requests under way have finished: not for
  // each, so that an overloaded daemon does not also switch threads for every request.
  [[nodiscard]] bool hasRoom(std::size_t otherBytes);

 private:
  static constexpr std::uint64_t kNever = std::numeric_limits<std::uint64_t>::max();

  bool isBelowBound(std::size_t otherBytes) const;

  const std::shared_ptr<IoWaker> waker_;
  const std::uint64_t connection_;

  // The I/O thread's.
  std::uint64_t startedRequests_ = 0;
  std::uint64_t startedBytes_ = 0;
  std::uint64_t knownFinishedRequests_ = 0;
  std::uint64_t knownFinishedBytes_ = 0;

  std::atomic<std::uint64_t> finishedRequests_{0};
  std::atomic<std::uint64_t> finishedBytes_{0};
  std::atomic<std::uint64_t> wakeAt_{kNever};  // the count of finished requests that the I/O thread waits for
};

}  // namespace tonewerk
