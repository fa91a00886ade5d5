// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>

#include "platform/RequestHandler.h"
#include "protocol/AudioEvent.h"
#include "protocol/Requests.h"
#include "service/MessageFilter.h"
#include "values/Value.h"

namespace tonewerk {

class TWReportingSession;
class TWReportingSessionMessage;

// Keeps the messages that one watching client wants to see, until the client's next request.
//
//   open() -> offer() offer() ... -> next() answers at once with what waits
//          -> next() held back    -> offer() has the work queue answer it, after what is queued by then
//
// A client that does not ask in time misses the oldest messages, and the next answer says how many. So it
// takes no more memory than the bounds below and delays nothing else. Used on the work queue.
class TapSubscriber final : public std::enable_shared_from_this<TapSubscriber> {
 public:
  // The most messages that wait, and the most bytes that they take together.
  static constexpr std::size_t kMaxMessages = 4096;
  static constexpr std::size_t kMaxBytes = std::size_t{4} << 20;
  // The most bytes of an answer. A larger message is missed.
  static constexpr std::size_t kMaxAnswerBytes = requests::kMaxMessagesBytes;
  // The bytes that a message counts for beside its payload and device, here and in an answer.
  static constexpr std::size_t kRecordBytes = 512;
  // A payload that nests deeper is missed: a frame may have 32 levels, and four of them are the answer's own.
  static constexpr std::size_t kMaxPayloadLevels = 28;

  // Starts over with `filter`: drops the waiting messages and the count of missed ones.
  void open(MessageFilter filter);
  bool isOpen() const { return isOpen_; }

  // Takes a message that a session has received and marked as redundant or not. If the filter matches,
  // keeps a reference to the payload.
  void offer(const TWReportingSession& session, const TWReportingSessionMessage& message);

  // Answers {"missed", "messages"}, at once or when there is something to answer. Only one request is held
  // back: if there is an earlier one, it is answered first, with what there is, perhaps nothing.
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
    std::string device;

    // An upper bound of what the message takes in an answer.
    std::size_t bytes() const;
    ValueMap toValue() const;
  };

  bool hasAnswer() const { return missed_ > 0 || !waiting_.empty(); }
  void keep(SeenMessage message);
  SeenMessage takeOldest();
  void answerQueued();
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
