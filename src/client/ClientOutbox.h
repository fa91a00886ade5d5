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

// Holds what a client has to send, who waits for answers, and what the daemon knows so far.
//
//   callers:  change(), send() ...        the thread:  connected()
//                                                      unsent() -> sent() ...   answered() ...
//                                                      disconnected(), and begin again
//
// The daemon knows what was sent; after connected() the resulting state of each session is sent again. What
// was not sent waits in its order. There is no thread and no socket in here: the engine's mutex is held
// during every call. Callers' functions are never called here, only added to the deliveries.
class ClientOutbox {
 public:
  // The daemon accepts as many on one connection.
  static constexpr std::size_t kMaxSessions = 4096;
  static constexpr std::size_t kMaxSenders = 4096;
  // How many callers may wait for a session's stop, all sessions together.
  static constexpr std::size_t kMaxStartReplies = 2 * kMaxSessions;
  // One request may wait for its answer for each so many bytes of the queue.
  static constexpr std::size_t kBytesPerReply = 64;
  // How many bytes closed senders' rings may hold while the daemon does not read. Beyond it their messages
  // move to the queue.
  static constexpr std::size_t kMaxClosedRingBytes = TWR_MOST_RING_BYTES;

  // `deliveries` outlives this.
  ClientOutbox(std::size_t queueBytes, Deliveries& deliveries);

  // ---- callers ----

  // Null when there are too many.
  [[nodiscard]] std::shared_ptr<twr_session> addSession(ClientEngine& engine, std::int64_t reporterID);
  // Returns TWR_FULL only with a reply: there is no room for the reply, so it will not be called, but the
  // change is made. A change that finds no room itself is not lost either: the session's new state is sent
  // once there is room.
  [[nodiscard]] twr_status change(twr_session& session, SessionChange change, PendingReply reply);
  // Destroys the session in the same way, and closes its senders.
  [[nodiscard]] twr_status destroy(twr_session& session, PendingReply reply);
  // Queues a message for `session`, or, if that is null, for `reporterIDs`. TWR_FULL: it is dropped and
  // counted.
  [[nodiscard]] twr_status send(twr_session* session, const RingMessage& message,
                                std::span<const std::int64_t> reporterIDs, PendingReply reply);
  [[nodiscard]] twr_status request(std::string body, PendingReply reply);
  // Finishes `waiter` when everything queued before it was sent, or when that failed.
  void addBarrier(std::shared_ptr<Waiter> waiter);
  void removeBarrier(const Waiter& waiter) { queue_.removeBarrier(waiter); }
  // Null when there are too many.
  [[nodiscard]] std::shared_ptr<twr_sender> openSender(twr_session& session,
                                                       const std::atomic<bool>& hasForked,
                                                       std::size_t ringBytes);
  void closeSender(twr_sender& sender);

  // ---- the thread ----

  void connected();
  // The bytes to send next; empty when there are none.
  std::string_view unsent();
  // The kernel has taken `bytes` of them. Also to be called with 0 when unsent() was empty.
  void sent(std::size_t bytes);
  void answered(const RpcFrame& response);
  // Callers that still wait for an answer get `why`.
  void disconnected(twr_status why = TWR_NOT_CONNECTED);
  void failBarriers(twr_status status);
  // Nothing is sent any more. All callers that wait for an answer get `why`.
  void end(twr_status why = TWR_NOT_CONNECTED);

  bool isEmpty() const { return queue_.empty() && batch_.empty() && toRecreate_.empty() && !hasRingData(); }
  // True while a caller waits for an answer that the daemon does not hold back.
  bool awaitsAnswers() const { return replies_.hasAwaited(); }
  bool hasSenders() const { return !senders_.empty(); }
  std::size_t queuedBytes() const { return queue_.bytes(); }
  std::uint64_t messagesSent() const { return messagesSent_; }
  std::uint64_t messagesDropped() const;
  // Counts the messages taken out of rings.
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
  void addWithoutBytes(Command command);
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
  void countLossBefore(CommandQueue::Iterator place, twr_session& session, std::uint64_t lost);
  void removeSender(twr_sender& sender);

  void deliver(const PendingReply& reply, const std::shared_ptr<DecodedAnswer>& answer);
  void deliver(StartReplies& starts, const std::shared_ptr<DecodedAnswer>& answer);

  Deliveries& deliveries_;
  const std::size_t maxReplies_;
  CommandQueue queue_;
  OutgoingBatch batch_;
  ReplyTable replies_;
  std::vector<std::shared_ptr<twr_session>> sessions_;  // in the order in which they were made
  std::size_t liveSessions_ = 0;                        // that their callers have not destroyed
  std::deque<std::shared_ptr<twr_session>> toRecreate_;
  std::vector<std::shared_ptr<twr_sender>> senders_;

  std::size_t replyCount_ = 0;       // accepted and not yet delivered, without those of starts
  std::size_t startReplyCount_ = 0;  // those of starts
  std::uint64_t messagesSent_ = 0;
  std::uint64_t dropped_ = 0;  // by the queue, and by rings that were removed
  std::uint64_t ringMessages_ = 0;
  bool isConnected_ = false;
  bool hasEnded_ = false;
};

}  // namespace tonewerk
