// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/IntervalWalk.h"

#include <memory>
#include <utility>

#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

double numberOrZero(const std::optional<Value>& value) { return value ? value->number() : 0.0; }

// When the message was sent; none when it does not say so.
std::optional<Value> timestampOf(const ValueMap& message) {
  const Value* timestamp = message.find(TWReportingMessageKeyTWTimestamp);
  return timestamp == nullptr ? std::nullopt : std::optional<Value>(*timestamp);
}

}  // namespace

Value IntervalWalk::Interval::length() const { return static_cast<double>(static_cast<float>(seconds)); }

Value IntervalWalk::Interval::bucketedLength() const {
  return TWReportingUtilityBucketNumberToString(seconds, TWReportingUtilityBucketNumberToStringTimes, 0)
      .value_or("");
}

IntervalWalk::IntervalWalk(const Kind& kind, const LogSite& site, double minimumSeconds, ValueMap defaults,
                           const ValueMap& previousValues)
    : kind_(kind), site_(site), minimumSeconds_(minimumSeconds), state_(std::move(defaults)) {
  state_.merge(previousValues);
  if (!state_.boolean(kind_.runningKey)) return;
  switch (kind_.openInterval) {
    case OpenInterval::kContinues:
      isRunning_ = true;
      begin_ = timestampOf(state_);
      break;
    case OpenInterval::kIgnored:
      // Without the key, the first message finds nothing running.
      state_.erase(kind_.runningKey);
      break;
    case OpenInterval::kNoBegin:
      break;
  }
}

TWReportingSessionMessages IntervalWalk::summariesOf(const TWReportingSessionMessages& messages) {
  for (const auto& message : messages) step(message->message);
  for (const auto& summary : summaries_) {
    summary->message.set(TWReportingMessageKeyMessageCount, summaries_.size());
  }
  return std::move(summaries_);
}

bool IntervalWalk::changesText(const ValueMap& message, std::string_view key) const {
  const Value* before = state_.find(key);
  const Value* now = message.find(key);
  return before != nullptr && now != nullptr && before->text() != now->text();
}

void IntervalWalk::step(const ValueMap& message) {
  const std::optional<Value> timestamp = timestampOf(message);
  const bool wasRunning = state_.boolean(kind_.runningKey);
  const bool isLast = message.contains(TWReportingMessageKeySessionDuration);
  bool ends = isLast;
  if (const Value* running = message.find(kind_.runningKey)) {
    isRunning_ = running->boolean();
    if (!wasRunning && isRunning_ && begins(message)) begin_ = timestamp;
    if (!isRunning_) ends = true;
  } else if (isLast) {
    isRunning_ = false;
  }
  if (isRunning_) {
    if (endsInterval(message)) ends = true;
    collect(message);
  }
  if (wasRunning && ends) {
    endInterval(timestamp);
    begin_ = timestamp;  // of the next interval, when output or input keeps running
  }
  if (!isRunning_) begin_.reset();
  state_.merge(message);
}

void IntervalWalk::endInterval(const std::optional<Value>& end) {
  std::optional<ValueMap> summary = summaryUntil(end);
  if (!summary) {
    debugLog(site_, "skipped %@ message, too short { func=%s, action=skip, count=%lu }", kind_.subject,
             kind_.function, summaries_.size());
    return;
  }
  summaries_.push_back(
      std::make_shared<TWReportingSessionMessage>(std::move(*summary), kind_.category, kTypeSummary));
  debugLog(site_, "added %@ message { func=%s, action=add, count=%lu }", kind_.subject, kind_.function,
           summaries_.size());
}

std::optional<ValueMap> IntervalWalk::summaryUntil(const std::optional<Value>& end) {
  const std::optional<double> seconds = measure(end);
  if (!seconds) return std::nullopt;
  return summaryOf({*seconds, static_cast<std::int32_t>(summaries_.size()) + 1});
}

// The length of the current interval in seconds. None when it is too short, when one of its times is missing,
// or when the length is not a number.
std::optional<double> IntervalWalk::measure(const std::optional<Value>& end) const {
  const double length = numberOrZero(end) - numberOrZero(begin_);
  debugLog(site_,
           "%@ { func=%s, %@=%f, twTimestamp=%@, twTimestamp_double=%f, startTwTimestamp=%@, "
           "startTwTimestamp_double=%f }",
           kind_.length, kind_.function, kind_.length, length, end, numberOrZero(end), begin_,
           numberOrZero(begin_));
  const bool isLongEnough =
      begin_ && end && length > minimumSeconds_;  // false when the length is not a number
  return isLongEnough ? std::optional<double>(length) : std::nullopt;
}

}  // namespace tonewerk
