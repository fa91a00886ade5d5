// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionMessage.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "platform/Log.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

TWReportingSessionMessage::TWReportingSessionMessage(ValueMap payload, AudioEventCategory messageCategory,
                                                     AudioEventType messageType)
    : message(std::move(payload)), category(messageCategory), type(messageType) {}

std::shared_ptr<TWReportingSessionMessage> TWReportingSessionMessage::copyWithZone() const {
  debugLog(TWReportingSessionCategory(), "copyWithZone");
  auto copy = std::make_shared<TWReportingSessionMessage>(message, category, type);
  copy->isRedundant = isRedundant;
  copy->isSessionStarted = isSessionStarted;
  return copy;
}

std::string TWReportingSessionMessage::description() const {
  return "category=" + TWReportingUtilityCategoryString(category) +
         " type=" + TWReportingUtilityTypeString(type) + " " + message.text();
}

double TWReportingSessionMessage::epochTime() const {
  return message.number(TWReportingInternalEventEpochTime);
}

void TWReportingSessionMessage::sortMessages(TWReportingSessionMessages& messages) {
  // Each time is read once, not at every comparison.
  struct Timed {
    double time;
    std::shared_ptr<TWReportingSessionMessage> message;
  };
  const auto earlier = [](const Timed& a, const Timed& b) { return a.time < b.time; };
  std::vector<Timed> timed;
  timed.reserve(messages.size());
  for (auto& message : messages) {
    const double time = message->epochTime();
    timed.push_back({std::isnan(time) ? 0.0 : time, std::move(message)});
  }
  if (!std::is_sorted(timed.begin(), timed.end(), earlier))
    std::stable_sort(timed.begin(), timed.end(), earlier);
  for (std::size_t at = 0; at < timed.size(); ++at) messages[at] = std::move(timed[at].message);
}

void TWReportingSessionMessage::lock() const {
  while (locked_.test_and_set(std::memory_order_acquire)) locked_.wait(true, std::memory_order_relaxed);
}

void TWReportingSessionMessage::unlock() const {
  locked_.clear(std::memory_order_release);
  locked_.notify_one();
}

}  // namespace tonewerk
