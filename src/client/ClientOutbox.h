// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "client/CommandQueue.h"
#include "client/DecodedAnswer.h"
#include "client/OutgoingBatch.h"
#include "client/ReplyTable.h"
#include "client/SessionRecord.h"
#include "platform/linux/messagepack/RpcFrame.h"

namespace tonewerk {

// What a client has to say, to whom it is owed an answer, and what its daemon knows so far.
//
//   callers:  change(), send() ...        the thread:  connected()
//                                                      unsent() -> sent() ...   answered() ...
//                                                      disconnected(), and begin again
//
// What has gone out is known to the daemon; it is told again, as the state it led to, after connected(). What
// has not gone out waits in its order. No thread and no socket in here: everything happens under the engine's
// mutex. Callers' functions are never called, only put into the deliveries.
class ClientOutbox {
 public:
  // As many as the daemon takes of one connection.
  static constexpr std::size_t kMaxSessions = 4096;
  static constexpr std::size_t kMaxSenders = 4096;
  // Callers that wait for a session's stop, all sessions together.
  static constexpr std::size_t kMaxStartReplies = 2 * kMaxSessions;
  // Of the queue's bytes, how many make room for one answer to wait for.
  static constexpr std::size_t kBytesPerReply = 64;
  // What closed senders may hold that wait for a daemon that reads nothing; past it they go to the queue.
  static constexpr std::size_t kMaxClosedRingBytes = TWR_MOST_RING_BYTES;

  // `deliveries` outlives this.
  ClientOutbox(std::size_t queueBytes, Deliveries& deliveries);

  // ---- callers ----

  // Null when there are too many.
  [[nodiscard]] std::shared_ptr<twr_session> addSession(ClientEngine& engine, std::int64_t reporterID);
  // TWR_FULL, only where there is a reply: it will not be called, for want of room; the change is made all
  // the same. One that finds no room itself is not lost, either: what the session has become is told once
  // there is room again.
  [[nodiscard]] twr_status change(twr_session& session, SessionChange change, PendingReply reply);
  // The same with a destroying change; the session's senders are closed.
  [[nodiscard]] twr_status destroy(twr_session& session, PendingReply reply);
  // A message, to a session or (null) to `reporterIDs`. TWR_FULL: dropped and counted.
  [[nodiscard]] twr_status send(twr_session* session, const RingMessage& message,
                                std::span<const std::int64_t> reporterIDs, PendingReply reply);
  [[nodiscard]] twr_status request(std::string body, PendingReply reply);
  // Finishes `waiter` when everything before has gone out, or when that failed.
  void addBarrier(std::shared_ptr<Waiter> waiter);
  void removeBarrier(const Waiter& waiter) { queue_.removeBarrier(waiter); }
  // Null when there are too many.
  [[nodiscard]] std::shared_ptr<twr_sender> openSender(twr_session& session,
                                                       const std::atomic<bool>& hasForked,
                                                       std::size_t ringBytes);
  void closeSender(twr_sender& sender);

  // ---- the thread ----

  void connected();
  // What can be sent next; empty when there is nothing.
  std::string_view unsent();
  // Also with 0, after unsent() was empty.
  void sent(std::size_t bytes);
  void answered(const RpcFrame& response);
  // Those who wait for an answer that was still to come are told `why`.
  void disconnected(twr_status why = TWR_NOT_CONNECTED);
  void failBarriers(twr_status status);
  // For good. Everybody who waits for an answer is told `why`.
  void end(twr_status why = TWR_NOT_CONNECTED);

  bool isEmpty() const { return queue_.empty() && batch_.empty() && toRecreate_.empty() && !hasRingData(); }
  // The daemon is to answer something, and will as soon as it can.
  bool awaitsAnswers() const { return replies_.hasAwaited(); }
  bool hasSenders() const { return !senders_.empty(); }
  std::size_t queuedBytes() const { return queue_.bytes(); }
  std::uint64_t messagesSent() const { return messagesSent_; }
  std::uint64_t messagesDropped() const;
  // Grows with every message taken out of a ring.
  std::uint64_t ringMessages() const { return ringMessages_; }

 private:
  [[nodiscard]] bool acceptReply(bool isStart);
  Command& add(Command command);
  void reconcileLater(twr_session& session);
  void forgetIfGone(twr_session& session);

  void fill();
  void recreate(twr_session& session);
  void encodeNext();
  void encodeMessage(Command command);
  void encodeLoss(Command command);
  void passOver(Command command);
  void encodeChange(Command command);
  void appendOf(twr_session& session, const RingMessage& message, OutgoingFrame& frame);
  void expand(Command reconciliation);
  void takeBack(OutgoingFrame frame);

  bool hasRingData() const;
  void close(twr_sender& sender);
  void drainQuietRings();
  [[nodiscard]] bool drainMarks(Command& command);
  [[nodiscard]] bool drain(twr_sender& sender, std::uint64_t position);
  void finish(twr_sender& sender);
  void appendFromRing(twr_session& session, const RingMessage& message, Command::Kind kind);
  void appendLoss(twr_session& session, std::uint64_t lostBefore);
  void absorbClosedRings();
  void absorb(twr_sender& sender);
  [[nodiscard]] bool absorbUpTo(twr_sender& sender, std::uint64_t position, CommandQueue::Iterator place);
  void absorbLoss(twr_sender& sender, CommandQueue::Iterator place);
  void insert(CommandQueue::Iterator place, twr_session& session, Command command);
  void loseBefore(CommandQueue::Iterator place, twr_session& session, std::uint64_t lost);
  void removeSender(twr_sender& sender);

  void deliver(const PendingReply& reply, const std::shared_ptr<DecodedAnswer>& answer);
  void deliver(StartReplies& starts, const std::shared_ptr<DecodedAnswer>& answer);

  Deliveries& deliveries_;
  const std::size_t mostReplies_;
  CommandQueue queue_;
  OutgoingBatch batch_;
  ReplyTable replies_;
  std::vector<std::shared_ptr<twr_session>> sessions_;  // in the order of their making
  std::size_t liveSessions_ = 0;                        // those not destroyed by their callers
  std::deque<std::shared_ptr<twr_session>> toRecreate_;
  std::vector<std::shared_ptr<twr_sender>> senders_;

  std::size_t replyCount_ = 0;       // accepted and not yet delivered, starts' apart
  std::size_t startReplyCount_ = 0;  // those
  std::uint64_t messagesSent_ = 0;
  std::uint64_t dropped_ = 0;  // at the queue, and by rings that are no more
  std::uint64_t ringMessages_ = 0;
  bool isConnected_ = false;
  bool hasEnded_ = false;
};

}  // namespace tonewerk
