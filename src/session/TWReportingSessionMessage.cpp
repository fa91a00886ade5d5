// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingSessionMessage.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <limits>
#include <utility>

#include "platform/Log.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

double sortedTimeOf(const TWReportingSessionMessage& record) {
  const double time = record.epochTime();
  return std::isnan(time) ? 0.0 : time;
}

}  // namespace

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
  // Mostly the messages came in order. Then they are neither moved nor copied.
  double latest = -std::numeric_limits<double>::infinity();
  const auto isLate = [&latest](const auto& record) {
    const double time = sortedTimeOf(*record);
    if (time < latest) return true;
    latest = time;
    return false;
  };
  if (std::none_of(messages.begin(), messages.end(), isLate)) return;

  // Each time is read once, not at every comparison. Places take less to move than records.
  struct Timed {
    double time;
    std::size_t place;
  };
  std::vector<Timed> timed;
  timed.reserve(messages.size());
  for (const auto& record : messages) timed.push_back({sortedTimeOf(*record), timed.size()});
  std::stable_sort(timed.begin(), timed.end(),
                   [](const Timed& a, const Timed& b) { return a.time < b.time; });
  TWReportingSessionMessages sorted;
  sorted.reserve(messages.size());
  for (const Timed& one : timed) sorted.push_back(std::move(messages[one.place]));
  messages = std::move(sorted);
}

void TWReportingSessionMessage::lock() const {
  while (locked_.flag.test_and_set(std::memory_order_acquire)) locked_.flag.wait(true, std::memory_order_relaxed);
}

void TWReportingSessionMessage::unlock() const {
  locked_.flag.clear(std::memory_order_release);
  locked_.flag.notify_one();
}

}  // namespace tonewerk
