// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>

#include "platform/RequestHandler.h"
#include "platform/linux/threads/BatchScope.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/Mutex.h"

namespace tonewerk {

// The outcome of a call: an answer, or the fact that there will be none.
struct DbusOutcome {
  std::uint32_t call = 0;
  bool isAnswered = false;
  std::optional<ReplyError> error;
  std::optional<Value> result;
};

// Carries the outcomes of a client's calls to the bus's thread, the only one that may use the bus. Lives on
// after the client as long as a reply may still come; such outcomes are dropped.
//
// Wakes the bus's thread once per batch of work.
class DbusOutbox final : public BatchScope::Deferred, public std::enable_shared_from_this<DbusOutbox> {
 public:
  // The waker wakes the bus's thread for `client`.
  DbusOutbox(std::shared_ptr<IoWaker> waker, std::uint64_t client)
      : waker_(std::move(waker)), client_(client) {}

  // Any thread.
  void add(DbusOutcome outcome);
  void endOfBatch() override;

  // The bus's thread.
  [[nodiscard]] std::optional<DbusOutcome> next();
  std::size_t unsentBytes() const { return unsentBytes_.load(std::memory_order_relaxed); }
  void close();

 private:
  const std::shared_ptr<IoWaker> waker_;
  const std::uint64_t client_;
  std::atomic<std::size_t> unsentBytes_{0};
  Mutex mutex_;
  std::deque<DbusOutcome> unsent_ GUARDED_BY(mutex_);
  bool isClosed_ GUARDED_BY(mutex_) = false;
  bool isWakeDeferred_ GUARDED_BY(mutex_) = false;  // to the end of a batch
};

// Answers one call. Only the first answer is sent, because a call on the bus has one answer. When it is
// destroyed without an answer, the outbox is told that there will be none.
class DbusReply final : public ReplySink {
 public:
  DbusReply(std::shared_ptr<DbusOutbox> outbox, std::uint32_t call)
      : outbox_(std::move(outbox)), call_(call) {}
  DbusReply(const DbusReply&) = delete;
  DbusReply& operator=(const DbusReply&) = delete;
  ~DbusReply() override;

  void reply(std::uint32_t call, const std::optional<ReplyError>& error,
             const std::optional<Value>& result) override;

 private:
  const std::shared_ptr<DbusOutbox> outbox_;
  const std::uint32_t call_;
  std::atomic<bool> isAnswered_ = false;
};

}  // namespace tonewerk
