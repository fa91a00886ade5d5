// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/IntervalSummaries.h"

#include <memory>
#include <utility>

#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

double numberOrZero(const std::optional<Value>& value) { return value ? value->number() : 0.0; }

}  // namespace

std::optional<Value> IntervalSummaries::timestampOf(const ValueMap& message) {
  const Value* timestamp = message.find(TWReportingMessageKeyTWTimestamp);
  return timestamp == nullptr ? std::nullopt : std::optional<Value>(*timestamp);
}

std::optional<double> IntervalSummaries::measure(const LogSite& site, const std::optional<Value>& begin,
                                                 const std::optional<Value>& end) const {
  const double length = numberOrZero(end) - numberOrZero(begin);
  debugLog(site,
           "%@ { func=%s, %@=%f, twTimestamp=%@, twTimestamp_double=%f, startTwTimestamp=%@, "
           "startTwTimestamp_double=%f }",
           words_.length, words_.function, words_.length, length, end, numberOrZero(end), begin,
           numberOrZero(begin));
  const bool isLongEnough = begin && end && length > minimumSeconds_;  // false when it is no number
  return isLongEnough ? std::optional<double>(length) : std::nullopt;
}

Value IntervalSummaries::seconds(double length) { return static_cast<double>(static_cast<float>(length)); }

Value IntervalSummaries::bucketedSeconds(double length) {
  return TWReportingUtilityBucketNumberToString(length, TWReportingUtilityBucketNumberToStringTimes, 0)
      .value_or("");
}

void IntervalSummaries::skip(const LogSite& site) const {
  debugLog(site, "skipped %@ message, too short { func=%s, action=skip, count=%lu }", words_.subject,
           words_.function, summaries_.size());
}

TWReportingSessionMessage& IntervalSummaries::add(const LogSite& site, ValueMap summary,
                                                  AudioEventCategory category) {
  summaries_.push_back(
      std::make_shared<TWReportingSessionMessage>(std::move(summary), category, kTypeSummary));
  debugLog(site, "added %@ message { func=%s, action=add, count=%lu }", words_.subject, words_.function,
           summaries_.size());
  return *summaries_.back();
}

TWReportingSessionMessages IntervalSummaries::finish() {
  for (const auto& summary : summaries_) {
    summary->message.set(TWReportingMessageKeyMessageCount, summaries_.size());
  }
  return std::move(summaries_);
}

}  // namespace tonewerk
