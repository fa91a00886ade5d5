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
  if (playback_.running != state.running) tellHeld();
  const Playback before = playback_;
  take(state);
  if (reporterID_ == 0 && described_) beginSession();

  if (playback_ == before) return;
  if (before.running && !playback_.running) {
    tell(clock_.now());
  } else {
    hold();
  }
}

void StreamReporter::overloaded(const Overload& overload) {
  overloads_.add(overload);
  if (reporterID_ != 0) tellOverload(overloads_.take(clock_.monotonic()));
}

void StreamReporter::restart() {
  const bool wasBegun = reporterID_ != 0;
  appearedAt_ = clock_.monotonic();
  reporterID_ = 0;
  told_.reset();
  held_.reset();
  overloads_.clear();
  if (wasBegun) beginSession();
  hold();
}

void StreamReporter::retell() {
  if (reporterID_ == 0) return;
  told_.reset();
  // What is held is told with all of the state in any case, and with the time at which it happened.
  if (!held_) hold();
}

void StreamReporter::end() {
  tellHeld();
  playback_.running = false;
  if (reporterID_ == 0) beginSession();
  tellOverload(overloads_.takeRest());
  ValueMap message = messageFor(clock_.now());
  message.set(kSessionDurationKey, std::chrono::duration<double>(clock_.monotonic() - appearedAt_).count());
  sink_.message(reporterID_, kOutputCategory, kStopType, std::move(message));
  sink_.stop(reporterID_);
  sink_.destroy(reporterID_);
}

std::optional<std::chrono::nanoseconds> StreamReporter::deadline() const {
  // A session waits for its description no longer than a message for its contents.
  if (reporterID_ == 0) return appearedAt_ + kLongestHold;
  const std::optional<std::chrono::nanoseconds> change = changeDeadline();
  const std::optional<std::chrono::nanoseconds> overload = overloads_.deadline();
  return change && overload ? std::min(change, overload) : (change ? change : overload);
}

std::optional<std::chrono::nanoseconds> StreamReporter::changeDeadline() const {
  if (!held_) return std::nullopt;
  const std::chrono::nanoseconds longest = held_->firstStep + kLongestHold;
  const bool waitsForMore = isStart() && !playback_.isComplete();
  return waitsForMore ? longest : std::min(longest, held_->lastStep + kSettleTime);
}

void StreamReporter::deadlineReached() {
  const std::chrono::nanoseconds now = clock_.monotonic();
  if (reporterID_ == 0 && now >= deadline()) beginSession();
  if (held_ && now >= changeDeadline()) tellHeld();
  if (reporterID_ != 0) tellOverload(overloads_.take(now));
}

// What the new state does not know, the playback keeps: a pause takes format and links away, but says nothing
// about what will be played next, or where.
void StreamReporter::take(const StreamState& state) {
  playback_.running = state.running;
  if (state.volume) playback_.volume = state.volume;
  if (state.format) playback_.format = state.format;
  if (!state.device.empty()) playback_.device = state.device;
  if (described_ && !state.described) return;
  described_ = state.described;
  application_ = state.application;
  role_ = state.role;
}

void StreamReporter::hold() {
  const bool differs = told_ ? playback_ != *told_ : playback_.running;
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

void StreamReporter::tellHeld() {
  if (held_) tell(held_->time);
}

void StreamReporter::tell(double time) {
  if (reporterID_ == 0) beginSession();
  held_.reset();
  told_ = playback_;
  sink_.message(reporterID_, kOutputCategory, kGenericType, messageFor(time));
}

void StreamReporter::tellOverload(const std::optional<Overload>& overload) {
  if (!overload) return;
  sink_.message(reporterID_, kIOCategory, kErrorType,
                {{kTimestampKey, overload->time},
                 {kIssueTypeKey, kOverloadIssue},
                 {kBufferFramesKey, overload->frames},
                 {kCycleKey, overload->cycle},
                 {kXrunCountKey, overload->xruns}});
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
