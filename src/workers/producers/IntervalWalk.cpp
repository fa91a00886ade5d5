// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/IntervalWalk.h"

#include <memory>
#include <set>
#include <utility>

#include "session/ForEachMessage.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

double numberOrZero(const std::optional<Value>& value) { return value ? value->number() : 0.0; }

std::optional<double> secondsOf(const std::optional<Value>& time) {
  return time ? std::optional(time->number()) : std::nullopt;
}

// When the message was sent; none when it does not say so.
std::optional<Value> timestampOf(const ValueMap& message) {
  const ValueView timestamp = message.view(TWReportingMessageKeyTWTimestamp);
  return timestamp ? std::optional<Value>(timestamp.value()) : std::nullopt;
}

}  // namespace

Value IntervalWalk::Interval::length() const { return static_cast<double>(static_cast<float>(seconds)); }

Value IntervalWalk::Interval::bucketedLength() const {
  return TWReportingUtilityBucketNumberToString(seconds, TWReportingUtilityBucketNumberToStringTimes, 0)
      .value_or("");
}

const Value IntervalWalk::kUnknownText("unknown");
const Value IntervalWalk::kFalse(false);
const Value IntervalWalk::kMinusOne(-1);

// Most walks end no interval and ask for nothing, so that the previous values are not searched either.
ValueView IntervalWalk::Latest::find() {
  if (!hasBegun_) {
    hasBegun_ = true;
    value_ = walk_.previousValues_.view(name_);
    if (!value_) value_ = ValueView(initial_);
  }
  const std::size_t current = walk_.walked_.size() - 1;
  for (std::size_t place = current; place > searched_; --place) {
    const ValueView found = in(place - 1);
    if (!found) continue;
    value_ = found;
    source_ = place;
    break;
  }
  searched_ = current;
  return value_;
}

ValueView IntervalWalk::Latest::now() { return in(walk_.walked_.size() - 1); }

// Remembers the message, because the walk mostly asks for the same one again at its next step.
ValueView IntervalWalk::Latest::in(std::size_t place) {
  if (lookedUp_ != place + 1) {
    lookedUp_ = place + 1;
    found_ = walk_.keys_.view(*walk_.walked_[place], key_);
  }
  return found_;
}

// These search for the earlier value first: it is in the message that in() remembers.
bool IntervalWalk::Latest::changesText() {
  const ValueView before = find();
  const ValueView after = now();
  if (!before || !after) return false;
  const auto textBefore = before.asText();
  const auto textAfter = after.asText();
  if (textBefore && textAfter) return noted(*textBefore != *textAfter);
  return noted(before.text() != after.text());
}

bool IntervalWalk::Latest::changesNumber() {
  const ValueView before = find();
  const ValueView after = now();
  return noted(before && after && before.number() != after.number());
}

bool IntervalWalk::Latest::changes() {
  const ValueView before = find();
  const ValueView after = now();
  return noted(before && after && !(before == after));
}

IntervalWalk::IntervalWalk(const Kind& kind, const LogSite& site, double minimumSeconds,
                           ValueMap previousValues)
    : kind_(kind),
      site_(site),
      minimumSeconds_(minimumSeconds),
      previousValues_(std::move(previousValues)),
      runningKey_(keys_.add(kind.runningKey)),
      durationKey_(keys_.add(TWReportingMessageKeySessionDuration)),
      wasRunning_(previousValues_.boolean(kind.runningKey)) {
  const bool runsBefore = wasRunning_;
  if (wasRunning_) beginRunning();
  if (auto* reasons = ReasonTrace::current())
    reasons->walkBegan({kind.category, kind.runningKey, minimumSeconds, runsBefore, secondsOf(begin_)});
}

void IntervalWalk::beginRunning() {
  switch (kind_.openInterval) {
    case OpenInterval::kContinues:
      isRunning_ = true;
      begin_ = timestampOf(previousValues_);
      break;
    case OpenInterval::kIgnored:
      // The first message finds nothing running.
      wasRunning_ = false;
      break;
    case OpenInterval::kNoBegin:
      break;
  }
}

TWReportingSessionMessages IntervalWalk::summariesOf(MessageRange messages,
                                                     std::span<const std::size_t> leftOut) {
  auto nextLeftOut = leftOut.begin();
  forEachMessage(messages, [&](std::size_t place, const TWReportingSessionMessage& record) {
    if (nextLeftOut != leftOut.end() && *nextLeftOut == place) {
      ++nextLeftOut;
      return;
    }
    if (!keys_.mayHaveAny(record.message)) return;
    walked_.push_back(&record.message);
    step();
  });
  for (const auto& summary : summaries_) {
    summary->message.set(TWReportingMessageKeyMessageCount, summaries_.size());
  }
  if (auto* reasons = ReasonTrace::current()) reasons->walkEnded(summaries_.size(), secondsOf(begin_));
  return std::move(summaries_);
}

void IntervalWalk::step() {
  running_ = keys_.view(message(), runningKey_);
  if (!wasRunning_ && !running_) return;
  const bool saysOn = running_.boolean();
  const bool isLast = static_cast<bool>(keys_.view(message(), durationKey_));
  bool ends = isLast;
  if (running_) {
    isRunning_ = saysOn;
    if (!wasRunning_ && isRunning_) beginInterval();
    if (!isRunning_) ends = true;
  } else if (isLast) {
    isRunning_ = false;
  }
  cause_ = running_ && !isRunning_ ? ReasonTrace::Cause::kStopped : ReasonTrace::Cause::kLast;
  if (isRunning_) {
    if (endsInterval()) {
      if (!isLast) cause_ = ReasonTrace::Cause::kChanged;
      ends = true;
    }
    collect();
  }
  if (wasRunning_ && ends) {
    const std::optional<Value> timestamp = timestampOf(message());
    endInterval(timestamp);
    begin_ = timestamp;  // of the next interval, when output or input keeps running
    beginPlace_ = walked_.size() - 1;
  }
  if (!isRunning_) begin_.reset();
  if (running_) wasRunning_ = saysOn;
}

void IntervalWalk::beginInterval() {
  const bool isBegin = begins();
  if (isBegin) {
    begin_ = timestampOf(message());
    beginPlace_ = walked_.size() - 1;
  }
  if (auto* reasons = ReasonTrace::current()) {
    reasons->stretchBegan(
        {message(), secondsOf(timestampOf(message())), isBegin ? std::string_view() : beginKey()});
  }
}

void IntervalWalk::endInterval(const std::optional<Value>& end) {
  outcome_ = ReasonTrace::Outcome::kSummary;
  std::optional<ValueMap> summary = summaryUntil(end);
  if (auto* reasons = ReasonTrace::current()) tellEnd(*reasons, end);
  if (!summary) {
    debugLog(site_, "skipped %@ message, too short { func=%s, action=skip, count=%lu }", kind_.subject,
             kind_.function, summaries_.size());
    return;
  }
  summaries_.push_back(
      std::make_shared<TWReportingSessionMessage>(std::move(*summary), kind_.category, kTypeSummary));
  summaries_.back()->details.setStretch({numberOrZero(begin_), numberOrZero(end)});
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
std::optional<double> IntervalWalk::measure(const std::optional<Value>& end) {
  const double length = numberOrZero(end) - numberOrZero(begin_);
  debugLog(site_,
           "%@ { func=%s, %@=%f, twTimestamp=%@, twTimestamp_double=%f, startTwTimestamp=%@, "
           "startTwTimestamp_double=%f }",
           kind_.length, kind_.function, kind_.length, length, end, numberOrZero(end), begin_,
           numberOrZero(begin_));
  const bool isLongEnough =
      begin_ && end && length > minimumSeconds_;  // false when the length is not a number
  if (isLongEnough) return length;
  outcome_ = !begin_ ? ReasonTrace::Outcome::kNoBegin
             : !end  ? ReasonTrace::Outcome::kNoEnd
                     : ReasonTrace::Outcome::kTooShort;
  return std::nullopt;
}

void IntervalWalk::tellEnd(ReasonTrace& reasons, const std::optional<Value>& end) {
  std::set<std::size_t> places;
  for (Latest* latest : latest_) {
    if (const auto place = latest->source()) places.insert(*place);
  }
  for (std::size_t place = beginPlace_; place < walked_.size(); ++place) {
    if (keys_.hasAny(*walked_[place])) places.insert(place);
  }
  std::vector<const ValueMap*> messages;
  messages.reserve(places.size());
  for (const std::size_t place : places) messages.push_back(walked_[place]);
  ReasonTrace::End told{.message = message(),
                        .cause = cause_,
                        .from = secondsOf(begin_),
                        .until = secondsOf(end),
                        .outcome = outcome_,
                        .index = static_cast<std::int32_t>(summaries_.size()) + 1,
                        .messages = messages};
  if (cause_ == ReasonTrace::Cause::kChanged && change_ != nullptr) {
    told.key = change_->name();
    told.before = change_->find();
    told.after = change_->now();
  }
  reasons.stretchEnded(told);
}

}  // namespace tonewerk
