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

// Counts a connection's unfinished requests and the bytes that they hold.
//
// The listener's thread counts the requests that it starts, and the thread that finishes a request counts its
// end. The listener's thread reads the second count only when the value that it read last says that the bound
// is reached.
class RequestWindow final : public InFlightCounter, public std::enable_shared_from_this<RequestWindow> {
 public:
  RequestWindow(std::shared_ptr<IoWaker> waker, std::uint64_t connection)
      : waker_(std::move(waker)), connection_(connection) {}

  // While it lives, requests that finish on its thread are counted together, at its end. Only for work on the
  // listener's thread, where nobody waits for them meanwhile. A thread has one batch at a time.
  class Batch {
   public:
    explicit Batch(RequestWindow& window);
    Batch(const Batch&) = delete;
    Batch& operator=(const Batch&) = delete;
    ~Batch();
  };

  // Any thread.
  void finished(std::size_t bytes) override;

  // The listener's thread. A request begins; it ends with finished() of the same bytes.
  void begin(std::size_t bytes);
  // The listener's thread. A request begins; it ends when the token is destroyed.
  [[nodiscard]] InFlightToken start(std::size_t bytes);

  // The listener's thread. True when there is room for another request beside `otherBytes` that the
  // connection holds. When there is none, the connection is woken once half of its unfinished requests have
  // finished. It is not woken for each, so that an overloaded daemon does not switch threads for every
  // request.
  [[nodiscard]] bool hasRoom(std::size_t otherBytes);

 private:
  static constexpr std::uint64_t kNever = std::numeric_limits<std::uint64_t>::max();

  void finished(std::uint64_t requests, std::uint64_t bytes);
  bool isBelowBound(std::size_t otherBytes) const;

  const std::shared_ptr<IoWaker> waker_;
  const std::uint64_t connection_;

  // Used by the listener's thread only.
  std::uint64_t startedRequests_ = 0;
  std::uint64_t startedBytes_ = 0;
  std::uint64_t knownFinishedRequests_ = 0;
  std::uint64_t knownFinishedBytes_ = 0;
  // Of the batch.
  std::uint64_t batchedRequests_ = 0;
  std::uint64_t batchedBytes_ = 0;

  std::atomic<std::uint64_t> finishedRequests_{0};
  std::atomic<std::uint64_t> finishedBytes_{0};
  // The count of finished requests that the listener's thread waits for.
  std::atomic<std::uint64_t> wakeAt_{kNever};
};

}  // namespace tonewerk
