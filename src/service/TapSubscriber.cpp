// SPDX-License-Identifier: Apache-2.0
#include "service/TapSubscriber.h"

#include <cassert>
#include <utility>
#include <vector>

#include "platform/SerialQueue.h"
#include "protocol/WatchKeys.h"
#include "service/SessionListing.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "values/Nesting.h"
#include "values/Shape.h"

namespace tonewerk {

void TapSubscriber::open(MessageFilter filter) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  isOpen_ = true;
  filter_ = std::move(filter);
  waiting_.clear();
  waitingBytes_ = 0;
  missed_ = 0;
}

void TapSubscriber::offer(const TWReportingSession& session, const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (!filter_.wants(session.reporterID(), message.category, message.type)) return;
  SeenMessage seen{session.reporterID(), session.serviceType(), message.category,    message.type,
                   message.isRedundant,  message.message,       shownDevice(session)};
  if (seen.bytes() > kMaxAnswerBytes) {
    ++missed_;
  } else {
    keep(std::move(seen));
  }
  // The answer is queued behind the work that is already there, so that many messages go into few answers.
  if (!isHeld_ || std::exchange(answerIsQueued_, true)) return;
  TWReportingUtilityGetReportingServerQueue().async([held = weak_from_this()] {
    if (const auto watcher = held.lock()) watcher->answerQueued();
  });
}

// Drops the oldest messages first, because a watcher wants to see what happens now.
void TapSubscriber::keep(SeenMessage message) {
  waitingBytes_ += message.bytes();
  waiting_.push_back(std::move(message));
  while (waiting_.size() > kMaxMessages || waitingBytes_ > kMaxBytes) {
    takeOldest();
    ++missed_;
  }
}

TapSubscriber::SeenMessage TapSubscriber::takeOldest() {
  SeenMessage oldest = std::move(waiting_.front());
  waiting_.pop_front();
  waitingBytes_ -= oldest.bytes();
  return oldest;
}

void TapSubscriber::next(Reply reply, InFlightToken token) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (isHeld_) answerHeld();
  if (hasAnswer()) return reply(std::nullopt, takeAnswer());
  isHeld_ = true;
  heldReply_ = std::move(reply);
  heldToken_ = std::move(token);
}

void TapSubscriber::answerQueued() {
  answerIsQueued_ = false;
  if (hasAnswer()) answerHeld();  // an earlier answer may have taken the messages
}

void TapSubscriber::answerHeld() {
  if (!std::exchange(isHeld_, false)) return;
  heldReply_(std::nullopt, takeAnswer());
  heldReply_ = Reply();
  heldToken_ = InFlightToken();
}

ValueMap TapSubscriber::takeAnswer() {
  std::vector<Value> messages;
  std::size_t bytes = 0;
  while (!waiting_.empty() && bytes + waiting_.front().bytes() <= kMaxAnswerBytes) {
    const SeenMessage oldest = takeOldest();
    if (!nestsWithin(oldest.payload, kMaxPayloadLevels)) {
      ++missed_;
      continue;
    }
    bytes += oldest.bytes();
    messages.emplace_back(oldest.toValue());
  }
  return {{kWatchKeyMissed, std::exchange(missed_, 0)}, {kWatchKeyMessages, ValueArray(std::move(messages))}};
}

// A packed map shares its keys with others, but an answer has them.
std::size_t TapSubscriber::SeenMessage::bytes() const {
  const Shape* shape = payload.shape();
  return kRecordBytes + payload.bytes() + device.size() + (shape == nullptr ? 0 : shape->wireBytes());
}

ValueMap TapSubscriber::SeenMessage::toValue() const {
  ValueMap value{{kWatchKeyReporterID, reporterID},
                 {kWatchKeyServiceType, serviceType},
                 {kWatchKeyCategory, category},
                 {kWatchKeyType, type},
                 {kWatchKeyRedundant, isRedundant},
                 {kWatchKeyTime, payload.number(TWReportingInternalEventEpochTime)},
                 {kWatchKeyApplication, shownApplication(payload)}};
  if (!device.empty()) value.set(kWatchKeyDevice, device);
  value.set(kWatchKeyPayload, payload);
  return value;
}

}  // namespace tonewerk
