// SPDX-License-Identifier: Apache-2.0
#include "client/ClientOutbox.h"

#include <algorithm>
#include <utility>

#include "client/MessageFrame.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {
namespace {

using Kind = SessionChange::Kind;

constexpr std::size_t kMinReplies = 64;

// How many bytes of the queue a message takes.
std::size_t bytesOf(std::size_t payloadBytes, std::size_t reporterIDs) {
  return kCommandBytes + payloadBytes + kMessageFrameBytes + reporterIDs * kReporterIDBytes;
}

// Copies a session's message into a command for the queue.
Command commandOf(const RingMessage& message) {
  Command command;
  command.message = message;
  command.message.bytes = {};
  command.body.assign(reinterpret_cast<const char*>(message.bytes.data()), message.bytes.size());
  command.bytes = bytesOf(message.bytes.size(), 1);
  command.lostBefore = message.lostBefore;
  return command;
}

// A message that only reports the losses before it.
RingMessage lossOf(const twr_session& session, std::uint64_t lostBefore) {
  return {session.losses.lastCategory(), TWR_TYPE_UNKNOWN, coarseSeconds(), lostBefore, 0, {}};
}

bool fitsFrame(const ValueMap& configuration) {
  std::string body;
  appendChange(body, {Kind::kConfiguration, TWR_SERVICE_UNKNOWN, configuration}, 0);
  return body.size() + RpcWriter::kMaxHeadBytes + kReporterIDBytes <= kMaxFrameBytes;
}

// A session's command has a mark in the ring of each of its senders.
std::size_t markBytes(const twr_session& session) { return session.senders.size() * sizeof(RingMark); }

std::vector<RingMark> marksOf(const std::vector<std::shared_ptr<twr_sender>>& senders) {
  std::vector<RingMark> marks;
  marks.reserve(senders.size());
  for (const std::shared_ptr<twr_sender>& sender : senders)
    marks.push_back({sender, sender->ring.writtenPosition(), sender->isClosed});
  return marks;
}

// Places the command after all messages that the session has sent or lost so far. The count is read first,
// because every loss in it happened before the positions that are read afterwards.
void placeLast(Command& command, const twr_session& session) {
  command.lostBefore = session.losses.count();
  command.marks = marksOf(session.senders);
}

}  // namespace

ClientOutbox::ClientOutbox(std::size_t queueBytes, Deliveries& deliveries)
    : deliveries_(deliveries),
      maxReplies_(std::max(kMinReplies, queueBytes / kBytesPerReply)),
      queue_(queueBytes) {}

// ---- callers ----

std::shared_ptr<twr_session> ClientOutbox::addSession(ClientEngine& engine, std::int64_t reporterID) {
  if (liveSessions_ >= kMaxSessions) return nullptr;
  auto session = std::make_shared<twr_session>(engine, reporterID);
  sessions_.push_back(session);
  ++liveSessions_;
  // Without a reply, a change that is not a configuration always succeeds.
  if (!hasEnded_) (void)change(*session, {}, {});
  return session;
}

twr_status ClientOutbox::change(twr_session& session, SessionChange change, PendingReply reply) {
  if (hasEnded_) return TWR_NOT_CONNECTED;
  SessionState wanted = session.wanted;
  wanted.apply(change);
  if (change.kind == Kind::kConfiguration && !fitsFrame(wanted.configuration)) return TWR_TOO_LARGE;

  const bool isStart = change.kind == Kind::kStart;
  Command command;
  command.kind = Command::Kind::kChange;
  command.session = session.shared_from_this();
  command.bytes = kCommandBytes + change.configuration.bytes() + markBytes(session);
  command.change = std::make_unique<SessionChange>(std::move(change));
  session.wanted = std::move(wanted);

  const bool hasRoom = queue_.hasRoomForChange(command.bytes);
  const bool takesReply = reply && hasRoom && acceptReply(isStart);
  reply.isStart = isStart;
  if (takesReply) command.reply = reply;
  if (hasRoom) {
    add(std::move(command));
  } else {
    reconcileLater(session);
  }
  return reply && !takesReply ? TWR_FULL : TWR_OK;
}

twr_status ClientOutbox::destroy(twr_session& session, PendingReply reply) {
  const std::shared_ptr<twr_session> kept = session.shared_from_this();
  session.isDestroyed = true;
  --liveSessions_;
  for (const std::shared_ptr<twr_sender>& sender : session.senders) close(*sender);
  absorbClosedRings();
  const twr_status status = change(session, {Kind::kDestroy, TWR_SERVICE_UNKNOWN, {}}, reply);
  forgetIfGone(session);
  return status;
}

twr_status ClientOutbox::send(twr_session* session, const RingMessage& message,
                              std::span<const std::int64_t> reporterIDs, PendingReply reply) {
  if (hasEnded_) return TWR_NOT_CONNECTED;
  const std::size_t bytes =
      bytesOf(message.bytes.size(), reporterIDs.size()) + (session == nullptr ? 0 : markBytes(*session));
  if (!queue_.hasRoomForMessage(bytes) || (reply && !acceptReply(false))) {
    ++dropped_;
    if (session != nullptr) session->losses.add(message.category);
    return TWR_FULL;
  }
  Command command = commandOf(message);
  command.bytes = bytes;
  if (session != nullptr) {
    command.session = session->shared_from_this();
  } else {
    command.reporterIDs.assign(reporterIDs.begin(), reporterIDs.end());
  }
  command.reply = reply;
  add(std::move(command));
  return TWR_OK;
}

twr_status ClientOutbox::request(std::string body, PendingReply reply) {
  if (hasEnded_) return TWR_NOT_CONNECTED;
  Command command;
  command.kind = Command::Kind::kRequest;
  command.bytes = kCommandBytes + body.size();
  if (!queue_.hasRoomForChange(command.bytes) || (reply && !acceptReply(false))) return TWR_FULL;
  command.body = std::move(body);
  command.reply = reply;
  add(std::move(command));
  return TWR_OK;
}

void ClientOutbox::addBarrier(std::shared_ptr<Waiter> waiter) {
  Command command;
  command.kind = Command::Kind::kBarrier;
  command.waiter = std::move(waiter);
  command.marks = marksOf(senders_);
  queue_.add(std::move(command));
}

bool ClientOutbox::acceptReply(bool isStart) {
  std::size_t& count = isStart ? startReplyCount_ : replyCount_;
  if (count >= (isStart ? kMaxStartReplies : maxReplies_)) return false;
  ++count;
  return true;
}

Command& ClientOutbox::add(Command command) {
  if (command.session != nullptr) {
    command.session->lastReconciliation = nullptr;
    placeLast(command, *command.session);
  }
  return queue_.add(std::move(command));
}

void ClientOutbox::reconcileLater(twr_session& session) {
  if (session.lastReconciliation == nullptr) {
    Command command;
    command.kind = Command::Kind::kReconcile;
    command.session = session.shared_from_this();
    command.wanted = std::make_unique<SessionState>();
    session.lastReconciliation = &add(std::move(command));
  }
  *session.lastReconciliation->wanted = session.wanted;
  placeLast(*session.lastReconciliation, session);
  // The session was made and destroyed before the daemon heard of it, so there is nothing to send.
  const bool wasNeverSent = !session.sent.exists && !session.wanted.exists && session.queued == 1;
  if (!wasNeverSent || session.unsent > 0 || !session.senders.empty()) return;
  queue_.remove(*session.lastReconciliation);
}

void ClientOutbox::forgetIfGone(twr_session& session) {
  const bool isGone = session.isDestroyed && session.queued == 0 && session.unsent == 0 &&
                      session.senders.empty() && (hasEnded_ || !session.sent.exists);
  if (isGone) std::erase_if(sessions_, [&](const auto& held) { return held.get() == &session; });
}

// ---- the thread ----

void ClientOutbox::connected() {
  isConnected_ = true;
  toRecreate_.clear();
  for (const std::shared_ptr<twr_session>& session : sessions_)
    if (session->sent.exists) toRecreate_.push_back(session);
}

std::string_view ClientOutbox::unsent() {
  fill();
  return batch_.unsent();
}

void ClientOutbox::fill() {
  while (!batch_.isFull() && !toRecreate_.empty()) {
    recreate(*toRecreate_.front());
    toRecreate_.pop_front();
  }
  if (!toRecreate_.empty()) return;
  drainQuietRings();
  while (!batch_.isFull() && !queue_.empty() && drainMarks(queue_.front())) encodeNext();
  // With an empty queue, no earlier request can follow the messages in the rings.
  if (queue_.empty()) drainQuietRings();
}

// Sends the state that the daemon knew of this session when the connection broke.
void ClientOutbox::recreate(twr_session& session) {
  for (const SessionChange& change : changesBetween({}, session.sent)) {
    OutgoingFrame frame;
    frame.origin = OutgoingFrame::Origin::kRecreation;
    const bool isAwaited = session.starts != nullptr && !session.starts->waiting.empty();
    if (change.kind == Kind::kStart && isAwaited) frame.identifier = replies_.add({{}, session.starts, true});
    RpcWriter(batch_.bytes()).head(frame.optionalIdentifier());
    appendChange(batch_.bytes(), change, session.identifier);
    batch_.add(std::move(frame));
  }
}

void ClientOutbox::encodeNext() {
  Command command = queue_.take();
  switch (command.kind) {
    case Command::Kind::kChange:
      return encodeChange(std::move(command));
    case Command::Kind::kReconcile:
      return expand(std::move(command));
    case Command::Kind::kMessage:
      return encodeMessage(std::move(command));
    case Command::Kind::kLoss:
      return encodeLoss(std::move(command));
    case Command::Kind::kRequest:
    case Command::Kind::kBarrier:
      break;
  }
  OutgoingFrame frame;
  if (command.reply) frame.identifier = replies_.add({command.reply, nullptr, false});
  if (command.kind != Command::Kind::kBarrier) RpcWriter(batch_.bytes()).head(frame.optionalIdentifier());
  batch_.bytes() += command.body;
  frame.command = std::move(command);
  batch_.add(std::move(frame));
}

void ClientOutbox::encodeMessage(Command command) {
  OutgoingFrame frame;
  if (command.reply) frame.identifier = replies_.add({command.reply, nullptr, false});
  RingMessage message = command.message;
  message.lostBefore = command.lostBefore;
  message.bytes = {reinterpret_cast<const unsigned char*>(command.body.data()), command.body.size()};
  if (command.session == nullptr) {
    appendMessageFrame(batch_.bytes(), frame.optionalIdentifier(), message, 0, command.reporterIDs);
    frame.isMessage = true;
  } else {
    appendOf(*command.session, message, frame);
    command.session->reported.lostLate += command.lostAfter;
  }
  frame.command = std::move(command);
  batch_.add(std::move(frame));
}

void ClientOutbox::encodeLoss(Command command) {
  if (command.session->reported.hasUnreported(command.lostBefore)) {
    encodeMessage(std::move(command));
  } else {
    addWithoutBytes(std::move(command));
  }
}

// Adds a frame without bytes. It keeps its place among the others until they are sent.
void ClientOutbox::addWithoutBytes(Command command) {
  OutgoingFrame frame;
  frame.reportedBefore = command.session->reported.counted;
  command.session->reported.lostLate += command.lostAfter;
  frame.command = std::move(command);
  batch_.add(std::move(frame));
}

// Appends a message of the session with the number of losses that no message has reported yet.
void ClientOutbox::appendOf(twr_session& session, const RingMessage& message, OutgoingFrame& frame) {
  frame.reportedBefore = session.reported.counted;
  frame.lateReported = session.reported.lostLate;
  const std::uint64_t dropped = session.reported.take(message.lostBefore);
  frame.bodyAt = appendMessageFrame(batch_.bytes(), frame.optionalIdentifier(), message, dropped,
                                    {&session.identifier, 1});
  frame.bodyBytes = message.bytes.size();
  frame.isMessage = true;
}

void ClientOutbox::encodeChange(Command command) {
  twr_session& session = *command.session;
  const SessionChange& change = *command.change;
  // Losses that no message has reported are reported now, because the session ends here.
  if (session.sent.exists && (change.kind == Kind::kStop || change.kind == Kind::kDestroy))
    appendLoss(session, command.lostBefore);
  OutgoingFrame frame;
  frame.reportedBefore = session.reported.counted;
  frame.stateBefore = std::make_unique<SessionState>(session.sent);
  frame.startsBefore = session.starts;
  frame.startCountBefore = session.starts == nullptr ? 0 : session.starts->waiting.size();

  const bool wasStarted = session.sent.isStarted;
  session.sent.apply(change);
  ReplyTable::Entry entry;
  if (change.kind == Kind::kStart) {
    if (command.reply) {
      if (session.starts == nullptr) session.starts = std::make_shared<StartReplies>();
      session.starts->waiting.push_back(command.reply);
    }
    // The daemon never answers the start of a started session. Its caller waits with the caller of the first
    // start.
    if (!wasStarted) entry = {{}, session.starts, true};
  } else {
    entry.reply = command.reply;
    // The daemon does not answer the start of a session that is destroyed or made again, nor a start that was
    // sent without a reply. The answer to the request that ended the run is delivered instead.
    if (wasStarted && !session.sent.isStarted) entry.starts = std::exchange(session.starts, nullptr);
  }
  if (entry.reply || (entry.starts != nullptr && !entry.starts->waiting.empty()))
    frame.identifier = replies_.add(std::move(entry));

  RpcWriter(batch_.bytes()).head(frame.optionalIdentifier());
  appendChange(batch_.bytes(), change, session.identifier);
  session.reported.lostLate += command.lostAfter;
  frame.command = std::move(command);
  batch_.add(std::move(frame));
}

// Replaces a reconciliation by the changes that the session still needs.
void ClientOutbox::expand(Command reconciliation) {
  std::vector<SessionChange> changes = changesBetween(reconciliation.session->sent, *reconciliation.wanted);
  if (changes.empty()) return addWithoutBytes(std::move(reconciliation));
  std::uint64_t lostAfter = reconciliation.lostAfter;
  for (auto change = changes.rbegin(); change != changes.rend(); ++change) {
    Command command;
    command.kind = Command::Kind::kChange;
    command.session = reconciliation.session;
    command.change = std::make_unique<SessionChange>(std::move(*change));
    command.lostBefore = reconciliation.lostBefore;
    command.lostAfter = std::exchange(lostAfter, 0);
    queue_.insert(queue_.begin(), std::move(command));
  }
  queue_.released(reconciliation.bytes);
}

void ClientOutbox::sent(std::size_t bytes) {
  for (OutgoingFrame& frame : batch_.sent(bytes)) {
    Command& command = frame.command;
    queue_.released(command.bytes);
    if (frame.isMessage) ++messagesSent_;
    if (command.waiter != nullptr) command.waiter->finish(TWR_OK);
    if (command.session != nullptr) forgetIfGone(*command.session);
  }
}

void ClientOutbox::answered(const RpcFrame& response) {
  std::optional<ReplyTable::Entry> entry = replies_.take(response.identifier);
  if (!entry) return;
  const auto answer = std::make_shared<DecodedAnswer>(response);
  if (entry->starts != nullptr)
    deliver(*entry->starts, entry->isStart ? answer : std::make_shared<DecodedAnswer>(TWR_OK));
  deliver(entry->reply, answer);
}

void ClientOutbox::disconnected(twr_status why) {
  isConnected_ = false;
  toRecreate_.clear();
  std::vector<OutgoingFrame> frames = batch_.takeBack();
  for (auto frame = frames.rbegin(); frame != frames.rend(); ++frame) takeBack(std::move(*frame));
  const auto lost = std::make_shared<DecodedAnswer>(why);
  for (const ReplyTable::Entry& entry : replies_.takeAll()) {
    deliver(entry.reply, lost);
    // Replies of a start stay, because the session is started again. Replies to a request that ends the run
    // are called, because it is not known whether the run has ended.
    if (!entry.isStart && entry.starts != nullptr) deliver(*entry.starts, lost);
  }
  absorbClosedRings();
}

void ClientOutbox::takeBack(OutgoingFrame frame) {
  if (frame.origin == OutgoingFrame::Origin::kRecreation) return;
  // The reply itself is in the command, which waits for it again in the queue.
  // Without an entry, the daemon has answered a request that it cannot have read. The reply was called then.
  if (frame.identifier != 0 && !replies_.take(frame.identifier)) frame.command.reply = {};
  if (frame.command.session != nullptr) {
    ReportedLosses& reported = frame.command.session->reported;
    reported.counted = frame.reportedBefore;
    reported.lostLate = reported.lostLate - frame.command.lostAfter + frame.lateReported;
  }
  if (frame.stateBefore != nullptr) {
    twr_session& session = *frame.command.session;
    session.sent = std::move(*frame.stateBefore);
    // The caller of a start waits with others, unless the daemon has answered what it cannot have read. The
    // reply was called then.
    if (frame.command.reply.isStart) {
      std::vector<PendingReply>& waiting = session.starts->waiting;
      if (waiting.size() > frame.startCountBefore) {
        waiting.resize(frame.startCountBefore);
      } else {
        frame.command.reply = {};
      }
    }
    session.starts = frame.startsBefore;
  }
  if (frame.origin == OutgoingFrame::Origin::kRing) {
    frame.command.bytes = bytesOf(frame.command.body.size(), 1);
    queue_.insert(queue_.begin(), std::move(frame.command));
  } else {
    queue_.putBack(std::move(frame.command));
  }
}

void ClientOutbox::failBarriers(twr_status status) {
  for (auto at = queue_.begin(); at != queue_.end();) {
    Command& command = *at++;
    if (command.waiter == nullptr) continue;
    command.waiter->finish(status);
    queue_.remove(command);
  }
}

void ClientOutbox::end(twr_status why) {
  disconnected(why);
  hasEnded_ = true;
  const auto lost = std::make_shared<DecodedAnswer>(why);
  for (Command& command : queue_.takeAll()) {
    if (command.kind == Command::Kind::kMessage) ++dropped_;
    if (command.waiter != nullptr) command.waiter->finish(TWR_NOT_CONNECTED);
    deliver(command.reply, lost);
  }
  for (const std::shared_ptr<twr_session>& session : sessions_) {
    const std::shared_ptr<StartReplies> starts = std::exchange(session->starts, nullptr);
    if (starts != nullptr) deliver(*starts, lost);
  }
  absorbClosedRings();  // drops their messages, since the outbox has ended
  std::erase_if(sessions_, [](const auto& session) { return session->isDestroyed; });
}

// ---- senders ----

std::shared_ptr<twr_sender> ClientOutbox::openSender(twr_session& session, const std::atomic<bool>& hasForked,
                                                     std::size_t ringBytes) {
  if (senders_.size() >= kMaxSenders) return nullptr;
  auto sender = std::make_shared<twr_sender>(session.shared_from_this(), hasForked, ringBytes);
  senders_.push_back(sender);
  session.senders.push_back(sender);
  return sender;
}

void ClientOutbox::closeSender(twr_sender& sender) {
  close(sender);
  absorbClosedRings();
}

void ClientOutbox::close(twr_sender& sender) {
  if (sender.isClosed) return;  // its caller closed it before the session; later losses are not its own
  sender.isClosed = true;
  if (const std::shared_ptr<twr_session> session = sender.session.lock())
    sender.lostAtClose = session->losses.count();
}

bool ClientOutbox::hasRingData() const {
  return std::any_of(senders_.begin(), senders_.end(), [](const std::shared_ptr<twr_sender>& sender) {
    return sender->isClosed || sender->ring.readPosition() != sender->ring.writtenPosition();
  });
}

// Sends the messages in rings of sessions without queued commands. Those would have to be sent first.
void ClientOutbox::drainQuietRings() {
  const auto isQuiet = [](const twr_sender& sender) { return sender.session.lock()->queued == 0; };
  for (const std::shared_ptr<twr_sender>& sender : senders_)
    if (isQuiet(*sender) && !drain(*sender, sender->ring.writtenPosition())) return;
  // Only after all were drained, because a loss of one ring may lie between messages of the others.
  for (std::size_t at = 0; at < senders_.size();) {
    const std::shared_ptr<twr_sender> sender = senders_[at];
    if (sender->isClosed && isQuiet(*sender)) {
      finish(*sender);  // takes it out of senders_
    } else {
      ++at;
    }
  }
}

// Sends the messages that were in rings before `command` was queued. False when the batch is full before that
// is done.
bool ClientOutbox::drainMarks(Command& command) {
  for (const RingMark& mark : command.marks)
    if (!drain(*mark.sender, mark.position)) return false;
  for (const RingMark& mark : std::exchange(command.marks, {}))
    if (mark.isClosed) finish(*mark.sender);
  return true;
}

bool ClientOutbox::drain(twr_sender& sender, std::uint64_t position) {
  const std::shared_ptr<twr_session> session = sender.session.lock();
  while (sender.ring.readPosition() < position) {
    if (batch_.isFull()) return false;
    const std::optional<RingMessage> message = sender.ring.front();
    if (!message) break;
    appendFromRing(*session, *message, Command::Kind::kMessage);
    sender.ring.pop();
  }
  return true;
}

// Removes a closed sender whose ring is drained. It may have been removed before.
void ClientOutbox::finish(twr_sender& sender) {
  const std::shared_ptr<twr_session> session = sender.session.lock();
  if (session != nullptr && sender.ring.dropped() > 0) appendLoss(*session, sender.lostAtClose);
  removeSender(sender);
}

void ClientOutbox::appendFromRing(twr_session& session, const RingMessage& message, Command::Kind kind) {
  OutgoingFrame frame;
  frame.origin = OutgoingFrame::Origin::kRing;
  frame.command.kind = kind;
  frame.command.session = session.shared_from_this();
  frame.command.message = message;
  frame.command.message.bytes = {};
  frame.command.lostBefore = message.lostBefore;
  appendOf(session, message, frame);
  batch_.add(std::move(frame));
  ++ringMessages_;
}

void ClientOutbox::appendLoss(twr_session& session, std::uint64_t lostBefore) {
  if (!session.reported.hasUnreported(lostBefore)) return;
  appendFromRing(session, lossOf(session, lostBefore), Command::Kind::kLoss);
}

// Moves the messages in closed rings to the queue, within its bound, while the daemon does not read them or
// reads them too slowly.
void ClientOutbox::absorbClosedRings() {
  std::size_t bytes = 0;
  std::vector<std::shared_ptr<twr_sender>> closed;
  for (const std::shared_ptr<twr_sender>& sender : senders_) {
    if (!sender->isClosed) continue;
    closed.push_back(sender);
    bytes += sender->ring.capacity();
  }
  if (isConnected_ && bytes <= kMaxClosedRingBytes) return;
  for (const std::shared_ptr<twr_sender>& sender : closed) absorb(*sender);
}

// Moves a ring's messages to the queue. Messages from before a queued command go before it.
void ClientOutbox::absorb(twr_sender& sender) {
  auto closing = queue_.end();  // the first command that was queued after the close
  bool isWhole = true;
  for (auto place = queue_.begin(); place != queue_.end(); ++place) {
    const auto mark = std::find_if(place->marks.begin(), place->marks.end(),
                                   [&](const RingMark& held) { return held.sender.get() == &sender; });
    if (mark == place->marks.end()) continue;
    isWhole = absorbUpTo(sender, mark->position, place) && isWhole;
    if (mark->isClosed && closing == queue_.end()) closing = place;
    place->marks.erase(mark);
  }
  isWhole = absorbUpTo(sender, sender.ring.writtenPosition(), queue_.end()) && isWhole;
  if (!isWhole || sender.ring.dropped() > 0) absorbLoss(sender, closing);
  removeSender(sender);
}

// False when a message was lost.
bool ClientOutbox::absorbUpTo(twr_sender& sender, std::uint64_t position, CommandQueue::Iterator place) {
  const std::shared_ptr<twr_session> session = sender.session.lock();
  std::uint64_t lost = 0;
  bool isWhole = true;
  while (sender.ring.readPosition() < position) {
    const std::optional<RingMessage> message = sender.ring.front();
    if (!message) break;
    if (hasEnded_ || !queue_.hasRoomForMessage(bytesOf(message->bytes.size(), 1))) {
      ++lost;
      ++dropped_;
      session->losses.setLastCategory(message->category);
      isWhole = false;
    } else {
      countLossBefore(place, *session, std::exchange(lost, 0));
      insert(place, *session, commandOf(*message));
    }
    sender.ring.pop();
  }
  countLossBefore(place, *session, lost);
  return isWhole;
}

// If there is no room, the session's next message or its end reports the loss.
void ClientOutbox::absorbLoss(twr_sender& sender, CommandQueue::Iterator place) {
  const std::shared_ptr<twr_session> session = sender.session.lock();
  Command command = commandOf(lossOf(*session, sender.lostAtClose));
  command.kind = Command::Kind::kLoss;
  if (!hasEnded_ && queue_.hasRoomForChange(command.bytes)) insert(place, *session, std::move(command));
}

void ClientOutbox::insert(CommandQueue::Iterator place, twr_session& session, Command command) {
  command.session = session.shared_from_this();
  session.lastReconciliation = nullptr;
  queue_.insert(place, std::move(command));
}

// Counts messages that the ring had taken and that are lost now, after the session's last command before
// `place`.
void ClientOutbox::countLossBefore(CommandQueue::Iterator place, twr_session& session, std::uint64_t lost) {
  if (lost == 0) return;
  while (place != queue_.begin()) {
    if ((--place)->session.get() != &session) continue;
    place->lostAfter += lost;
    return;
  }
  session.reported.lostLate += lost;
}

void ClientOutbox::removeSender(twr_sender& sender) {
  const auto isIt = [&](const std::shared_ptr<twr_sender>& held) { return held.get() == &sender; };
  // A queued command may still have a mark of a sender that was removed.
  if (std::erase_if(senders_, isIt) == 0) return;
  dropped_ += sender.ring.dropped();
  const std::shared_ptr<twr_session> session = sender.session.lock();
  std::erase_if(session->senders, isIt);
  forgetIfGone(*session);
}

std::uint64_t ClientOutbox::messagesDropped() const {
  std::uint64_t dropped = dropped_;
  for (const std::shared_ptr<twr_sender>& sender : senders_) dropped += sender->ring.dropped();
  return dropped;
}

void ClientOutbox::deliver(const PendingReply& reply, const std::shared_ptr<DecodedAnswer>& answer) {
  if (!reply) return;
  --(reply.isStart ? startReplyCount_ : replyCount_);
  deliveries_.push_back({reply, answer, std::nullopt});
}

void ClientOutbox::deliver(StartReplies& starts, const std::shared_ptr<DecodedAnswer>& answer) {
  for (const PendingReply& reply : std::exchange(starts.waiting, {})) deliver(reply, answer);
}

}  // namespace tonewerk
