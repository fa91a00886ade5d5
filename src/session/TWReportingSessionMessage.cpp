// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionMessage.h"

#include <cstddef>
#include <utility>

#include "platform/Log.h"
#include "session/MessageRange.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

const MessageDetails::WorkerClasses MessageDetails::kNoWorkers;

TWReportingSessionMessage::TWReportingSessionMessage(ValueMap payload, AudioEventCategory messageCategory,
                                                     AudioEventType messageType)
    : message(std::move(payload)), category(messageCategory), type(messageType) {}

std::shared_ptr<TWReportingSessionMessage> TWReportingSessionMessage::copyWithZone() const {
  debugLog(TWReportingSessionCategory(), "copyWithZone");
  auto copy = std::make_shared<TWReportingSessionMessage>(message, category, type);
  copy->isRedundant = isRedundant;
  copy->isSessionStarted = isSessionStarted;
  copy->isDerived = isDerived;
  return copy;
}

std::string TWReportingSessionMessage::description() const {
  return "category=" + TWReportingUtilityCategoryString(category) +
         " type=" + TWReportingUtilityTypeString(type) + " " + message.text();
}

double TWReportingSessionMessage::epochTime() const {
  return message.number(TWReportingInternalEventEpochTime);
}

bool TWReportingSessionMessage::sortMessages(TWReportingSessionMessages& messages) {
  const std::vector<std::size_t> places = placesByTime(messages);
  if (places.empty()) return false;
  TWReportingSessionMessages sorted;
  sorted.reserve(messages.size());
  for (const std::size_t place : places) sorted.push_back(std::move(messages[place]));
  messages = std::move(sorted);
  return true;
}

void TWReportingSessionMessage::lock() const {
  while (locked_.flag.test_and_set(std::memory_order_acquire))
    locked_.flag.wait(true, std::memory_order_relaxed);
}

void TWReportingSessionMessage::unlock() const {
  locked_.flag.clear(std::memory_order_release);
  locked_.flag.notify_one();
}

}  // namespace tonewerk
