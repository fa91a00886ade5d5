// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/StreamReporter.h"

#include <algorithm>
#include <utility>

#include "bridges/pipewire/ReportingVocabulary.h"
#include "bridges/pipewire/graph/StreamDescription.h"
#include "values/Value.h"

namespace tonewerk {

StreamReporter::StreamReporter(SessionSink& sink, const Clock& clock, ReporterIdentifiers& identifiers)
    : sink_(sink), clock_(clock), identifiers_(identifiers), appearedAt_(clock.monotonic()) {}

void StreamReporter::update(const StreamState& state) {
  if (playback_.running != state.running) sendHeldChange();
  const Playback before = playback_;
  mergeState(state);
  if (reporterID_ == 0 && described_) beginSession();

  if (playback_ == before) return;
  if (before.running && !playback_.running) {
    sendState(clock_.now());
  } else {
    holdChange();
  }
}

void StreamReporter::overloaded(const Overload& overload) {
  overloads_.add(overload);
  if (reporterID_ != 0) sendOverloads(overloads_.take(clock_.monotonic()));
}

void StreamReporter::restart() {
  const bool wasBegun = reporterID_ != 0;
  appearedAt_ = clock_.monotonic();
  reporterID_ = 0;
  reported_.reset();
  held_.reset();
  overloads_.clear();
  if (wasBegun) beginSession();
  holdChange();
}

void StreamReporter::resend() {
  if (reporterID_ == 0) return;
  reported_.reset();
  // A held change is sent anyway, with the whole state and with the time of the change.
  if (!held_) holdChange();
}

void StreamReporter::end() {
  sendHeldChange();
  playback_.running = false;
  if (reporterID_ == 0) beginSession();
  sendOverloads(overloads_.takeRest());
  ValueMap message = messageFor(clock_.now());
  message.set(kSessionDurationKey, std::chrono::duration<double>(clock_.monotonic() - appearedAt_).count());
  sink_.message(reporterID_, kOutputCategory, kStopType, std::move(message));
  sink_.stop(reporterID_);
  sink_.destroy(reporterID_);
}

std::optional<std::chrono::nanoseconds> StreamReporter::deadline() const {
  // A session waits for its description no longer than a start waits for its values.
  if (reporterID_ == 0) return appearedAt_ + kMaxHold;
  const std::optional<std::chrono::nanoseconds> change = changeDeadline();
  const std::optional<std::chrono::nanoseconds> overload = overloads_.deadline();
  return change && overload ? std::min(change, overload) : (change ? change : overload);
}

std::optional<std::chrono::nanoseconds> StreamReporter::changeDeadline() const {
  if (!held_) return std::nullopt;
  const std::chrono::nanoseconds longest = held_->firstStep + kMaxHold;
  const bool waitsForMore = isStart() && !playback_.isComplete();
  return waitsForMore ? longest : std::min(longest, held_->lastStep + kSettleTime);
}

void StreamReporter::deadlineReached() {
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (reporterID_ == 0 && now >= deadline()) beginSession();
  if (held_ && now >= changeDeadline()) sendHeldChange();
  if (reporterID_ != 0) sendOverloads(overloads_.take(now));
}

// The playback keeps its values where the new state has none: a pause removes the format and the links, but
// does not say that the next playback will use others.
void StreamReporter::mergeState(const StreamState& state) {
  playback_.running = state.running;
  if (state.volume) playback_.volume = state.volume;
  if (state.format) playback_.format = state.format;
  if (!state.device.empty()) playback_.device = state.device;
  if (described_ && !state.described) return;
  described_ = state.described;
  application_ = state.application;
  role_ = state.role;
}

void StreamReporter::holdChange() {
  const bool differs = reported_ ? playback_ != *reported_ : playback_.running;
  if (!differs) {
    held_.reset();
    return;
  }
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (!held_) {
    held_ = HeldChange{clock_.now(), now, now};
    return;
  }
  held_->lastStep = now;
  if (!isStart()) held_->time = clock_.now();
}

void StreamReporter::sendHeldChange() {
  if (held_) sendState(held_->time);
}

void StreamReporter::sendState(double time) {
  if (reporterID_ == 0) beginSession();
  held_.reset();
  reported_ = playback_;
  sink_.message(reporterID_, kOutputCategory, kGenericType, messageFor(time));
}

void StreamReporter::sendOverloads(const std::vector<Overload>& overloads) {
  for (const Overload& overload : overloads) {
    ValueMap message{{kTimestampKey, overload.time},
                     {kIssueTypeKey, kOverloadIssue},
                     {kBufferFramesKey, overload.frames},
                     {kCycleKey, overload.cycle},
                     {kXrunCountKey, overload.xruns}};
    const OverloadVerdict& verdict = overload.verdict;
    if (!verdict.key.empty()) {
      message.set(kGlitchOverKey, verdict.overMilliseconds);
      message.set(kGlitchLostKey, verdict.lostMilliseconds);
      message.merge(verdict.values);
    }
    sink_.message(reporterID_, kIOCategory, kErrorType, std::move(message));
  }
}

void StreamReporter::beginSession() {
  reporterID_ = identifiers_.next();
  sink_.create(reporterID_);
  sink_.configure(reporterID_, serviceTypeOf(role_), {{kApplicationKey, application_}});
  sink_.start(reporterID_);
}

ValueMap StreamReporter::messageFor(double time) const {
  ValueMap message{{kTimestampKey, time}, {kRunningKey, playback_.running}};
  if (playback_.volume) message.set(kVolumeKey, *playback_.volume);
  if (!playback_.device.empty()) message.set(kDevicesKey, playback_.device);
  if (playback_.format) {
    message.set(kFormatKey, playback_.format->text());
    message.set(kFormatIDKey, playback_.format->coding);
    message.set(kChannelsKey, static_cast<std::int64_t>(playback_.format->channels));
  }
  return message;
}

}  // namespace tonewerk
