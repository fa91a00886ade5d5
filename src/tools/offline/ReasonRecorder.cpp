// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/ReasonRecorder.h"

#include <ostream>
#include <string>
#include <vector>

#include "platform/SessionBook.h"
#include "platform/accounts/WorkingFor.h"
#include "protocol/EventTexts.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "tools/recording/ReasonKeys.h"
#include "values/CompactJson.h"

namespace tonewerk {
namespace {

using namespace reasons;

std::string_view textOf(ReasonTrace::Cause cause) {
  switch (cause) {
    case ReasonTrace::Cause::kStopped:
      return kCauseStopped;
    case ReasonTrace::Cause::kLast:
      return kCauseLast;
    case ReasonTrace::Cause::kChanged:
      break;
  }
  return kCauseChanged;
}

std::string_view textOf(ReasonTrace::Outcome outcome) {
  switch (outcome) {
    case ReasonTrace::Outcome::kSummary:
      return kOutcomeSummary;
    case ReasonTrace::Outcome::kTooShort:
      return kOutcomeTooShort;
    case ReasonTrace::Outcome::kNoBegin:
      return kOutcomeNoBegin;
    case ReasonTrace::Outcome::kNoEnd:
      return kOutcomeNoEnd;
    case ReasonTrace::Outcome::kNoApplication:
      return kOutcomeNoApplication;
    case ReasonTrace::Outcome::kNoVolume:
      return kOutcomeNoVolume;
    case ReasonTrace::Outcome::kNotInGather:
      break;
  }
  return kOutcomeNotInGather;
}

void setIfKnown(ValueMap& line, std::string_view key, const std::optional<double>& number) {
  if (number) line.set(key, *number);
}

void setIfKnown(ValueMap& line, std::string_view key, ValueView value) {
  if (value) line.set(key, value.text());
}

}  // namespace

ReasonRecorder::Life& ReasonRecorder::lifeOf(const TWReportingSession& session) {
  Life& life = lives_[&session];
  if (life.number == 0) life.number = ++lastLife_;
  return life;
}

ValueMap ReasonRecorder::line(std::string_view what) const {
  return {{kWhat, what}, {kLife, stopping_ == nullptr ? 0 : stopping_->number}};
}

void ReasonRecorder::write(const ValueMap& line) {
  std::string text;
  appendCompactJson(text, line);
  out_ << text << '\n';
}

void ReasonRecorder::lifeBegan(const TWReportingSession& session, const SessionBeginning& beginning) {
  ValueMap begin{{kWhat, kBegin},
                 {kLife, lifeOf(session).number},
                 {kReporter, beginning.reporterID},
                 {kAt, beginning.at},
                 {kService, session.serviceName()}};
  if (const Account* account = WorkingFor::accountIfAny()) begin.set(kUser, account->user());
  begin.set(kApplication, session.applicationName());
  if (const auto process = session.clientProcessName()) begin.set(kProcess, *process);
  write(begin);
}

void ReasonRecorder::lifeEnded(const TWReportingSession& session, const SessionEnd& end) {
  write({{kWhat, kEnd},
         {kLife, lifeOf(session).number},
         {kReporter, session.reporterID()},
         {kAt, end.at},
         {kEnding, textOf(end.ending)},
         {kMessages, end.messages},
         {kRedundant, end.redundantMessages},
         {kOverloads, end.overloads}});
  lives_.erase(&session);
  stopping_ = nullptr;
}

void ReasonRecorder::messageArrived(const TWReportingSession& session, const Arrival& arrival) {
  Life& life = lifeOf(session);
  const TWReportingSessionMessage& message = arrival.message;
  const Number number = ++life.messages;
  ValueMap line{{kWhat, kMessage},
                {kLife, life.number},
                {kNumber, number},
                {kAt, message.epochTime()},
                {kCategory, TWReportingUtilityCategoryString(message.category)},
                {kType, TWReportingUtilityTypeString(message.type)},
                {kRedundant, message.isRedundant},
                {kDerived, message.isDerived},
                {kKept, arrival.kept != nullptr}};
  if (arrival.repeated != nullptr) {
    const auto repeated = life.byPayload.find(&arrival.repeated->message);
    line.set(kRepeats, repeated == life.byPayload.end() ? 0 : repeated->second);
  }
  line.set(kPayload, message.message);
  if (arrival.kept != nullptr) {
    life.byPayload[&arrival.kept->message] = number;
    life.byKind.emplace(Kind{{message.category, message.type}, message.epochTime()}, number);
  }
  write(line);
}

// Sorting moved the messages, and kept those of equal times in the order of their arrival.
void ReasonRecorder::stopping(const TWReportingSession& session) {
  Life& life = lifeOf(session);
  stopping_ = &life;
  life.byPayload.clear();
  for (const TWReportingSessionMessage* message : session.messages()) {
    const auto found = life.byKind.find({{message->category, message->type}, message->epochTime()});
    if (found == life.byKind.end()) continue;  // one of the session itself
    // find() may give any of several equal ones.
    const auto first = life.byKind.lower_bound(found->first);
    life.byPayload[&message->message] = first->second;
    life.byKind.erase(first);
  }
}

void ReasonRecorder::walkBegan(const Walk& walk) {
  ValueMap line = this->line(kWalk);
  line.set(kCategory, TWReportingUtilityCategoryString(walk.category));
  line.set(kKey, walk.runningKey);
  line.set(kMinimum, walk.minimumSeconds);
  line.set(kRunsBefore, walk.runsBefore);
  setIfKnown(line, kSince, walk.since);
  write(line);
}

ReasonRecorder::Number ReasonRecorder::numberOf(const ValueMap& message) const {
  if (stopping_ == nullptr) return 0;
  const auto found = stopping_->byPayload.find(&message);
  return found == stopping_->byPayload.end() ? 0 : found->second;
}

void ReasonRecorder::setMessage(ValueMap& line, std::string_view key, const ValueMap& message) const {
  if (const Number number = numberOf(message)) line.set(key, number);
}

void ReasonRecorder::rapidMessage(const Merge& merge) {
  ValueMap line = this->line(kRapid);
  setMessage(line, kInto, merge.into);
  setMessage(line, kNumber, merge.message);
  line.set(kPause, merge.pause);
  line.set(kMaximum, merge.maximum);
  line.set(kMerged, merge.isMerged);
  write(line);
}

void ReasonRecorder::stretchBegan(const Begin& begin) {
  ValueMap line = this->line(kStretch);
  setMessage(line, kNumber, begin.message);
  setIfKnown(line, kAt, begin.at);
  if (!begin.condition.empty()) line.set(kCondition, begin.condition);
  write(line);
}

void ReasonRecorder::stretchEnded(const End& end) {
  ValueMap line = this->line(kStretchEnd);
  setMessage(line, kNumber, end.message);
  line.set(kCause, textOf(end.cause));
  if (!end.key.empty()) line.set(kKey, end.key);
  setIfKnown(line, kBefore, end.before);
  setIfKnown(line, kAfter, end.after);
  setIfKnown(line, kFrom, end.from);
  setIfKnown(line, kUntil, end.until);
  line.set(kOutcome, textOf(end.outcome));
  if (end.outcome == Outcome::kSummary) line.set(kIndex, end.index);
  std::vector<Value> messages;
  for (const ValueMap* message : end.messages) {
    if (const Number number = numberOf(*message)) messages.emplace_back(number);
  }
  line.set(kMessages, ValueArray(std::move(messages)));
  write(line);
}

void ReasonRecorder::walkEnded(std::size_t summaries, std::optional<double> runsSince) {
  ValueMap line = this->line(kWalkEnd);
  line.set(kSummaries, static_cast<std::uint64_t>(summaries));
  setIfKnown(line, kRunsSince, runsSince);
  write(line);
}

}  // namespace tonewerk
