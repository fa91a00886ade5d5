// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>

#include "platform/RequestHandler.h"
#include "protocol/AudioEvent.h"
#include "protocol/Requests.h"
#include "service/MessageFilter.h"
#include "values/Value.h"

namespace tonewerk {

class TWReportingSession;
class TWReportingSessionMessage;

// One client that watches messages: what it wants, and what has arrived and waits for its next request.
//
//   open() -> offer() offer() ... -> next() answers at once with what waits
//          -> next() held back    -> offer() has the work queue answer it, after what is queued by then
//
// A client that does not ask in time misses the oldest messages, and is told how many; so it costs no more
// than the bounds below, and delays nobody. On the work queue.
class TapSubscriber final : public std::enable_shared_from_this<TapSubscriber> {
 public:
  // What waits: so many messages, and of so many bytes together.
  static constexpr std::size_t kMaxMessages = 4096;
  static constexpr std::size_t kMaxBytes = std::size_t{4} << 20;
  // What an answer may come to. A message that alone comes to more is missed.
  static constexpr std::size_t kMaxAnswerBytes = requests::kMaxMessagesBytes;
  // What a message comes to beside its payload, here and in an answer.
  static constexpr std::size_t kRecordBytes = 512;
  // A payload nested deeper is missed: a frame may nest 32 levels, and the answer puts four around it.
  static constexpr std::size_t kMaxPayloadLevels = 28;

  // Begins anew: forgets what waits and what was missed.
  void open(MessageFilter filter);
  bool isOpen() const { return isOpen_; }

  // A message that a session has received and judged. Keeps a reference to its payload, if it is wanted.
  void offer(const TWReportingSession& session, const TWReportingSessionMessage& message);

  // Answers {"missed", "messages"}, now or when there is something. A request that is still held back is
  // answered with nothing: there is one at a time.
  void next(Reply reply, InFlightToken token);

  std::size_t waitingMessages() const { return waiting_.size(); }
  std::size_t waitingBytes() const { return waitingBytes_; }

 private:
  struct SeenMessage {
    ReporterID reporterID;
    AudioServiceType serviceType;
    AudioEventCategory category;
    AudioEventType type;
    bool isRedundant;
    ValueMap payload;

    std::size_t bytes() const { return kRecordBytes + payload.bytes(); }
    ValueMap shown() const;
  };

  bool hasNews() const { return missed_ > 0 || !waiting_.empty(); }
  void keep(SeenMessage message);
  SeenMessage takeOldest();
  void answerWithNews();
  void answerHeld();
  ValueMap takeAnswer();

  bool isOpen_ = false;
  MessageFilter filter_;
  std::deque<SeenMessage> waiting_;
  std::size_t waitingBytes_ = 0;
  std::uint64_t missed_ = 0;  // since the last answer

  bool isHeld_ = false;
  bool answerIsQueued_ = false;
  Reply heldReply_;
  InFlightToken heldToken_;
};

}  // namespace tonewerk
