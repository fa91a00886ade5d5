// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionGatherMessagesWorker.h"

#include <optional>
#include <string_view>

#include "platform/Log.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "workers/producers/IntervalSummaries.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

namespace tonewerk {
namespace {

constexpr IntervalSummaries::Words kWords{"createGatherMessages", "gather", "playingTime"};

ValueMap defaultState() {
  return {{TWReportingMessageKeySelectedFormat, "unknown"},
          {TWReportingMessageKeyActiveDevices, "unknown"},
          {TWReportingMessageKeyFormatID, "unknown"},
          {TWReportingMessageKeyChannelsPerFrame, -1}};
}

bool isInGather(const ValueMap& map) { return map.integer(TWReportingMessageKeyGatherSession) == 1; }

bool differsAsText(const ValueMap& state, const ValueMap& message, std::string_view key) {
  const Value* before = state.find(key);
  const Value* now = message.find(key);
  return before != nullptr && now != nullptr && before->text() != now->text();
}

// One walk over a session's messages.
class Walk {
 public:
  // A stretch that the previous values show as open goes on from their time.
  Walk(const ValueMap& previousValues, double minimumPlaytime)
      : state_(defaultState()), summaries_(kWords, minimumPlaytime) {
    state_.merge(previousValues);
    isPlaying_ = state_.boolean(TWReportingMessageKeySessionOutputRunning);
    if (isPlaying_) stretchStart_ = IntervalSummaries::timestampOf(state_);
  }

  void step(const ValueMap& message) {
    const std::optional<Value> timestamp = IntervalSummaries::timestampOf(message);
    const bool wasPlaying = state_.boolean(TWReportingMessageKeySessionOutputRunning);
    bool closes = message.contains(TWReportingMessageKeySessionDuration);
    if (const Value* running = message.find(TWReportingMessageKeySessionOutputRunning)) {
      isPlaying_ = running->boolean();
      if (!wasPlaying && isPlaying_ && isInGather(message)) stretchStart_ = timestamp;
      if (!isPlaying_ || (isInGather(state_) && !isInGather(message))) closes = true;
    } else if (closes) {
      isPlaying_ = false;
    }
    if (wasPlaying && (closes || contextCloses(message))) {
      closeStretch(timestamp);
      stretchStart_ = timestamp;  // of the next one, when output keeps running
    }
    if (!isPlaying_) stretchStart_.reset();
    state_.merge(message);
  }

  TWReportingSessionMessages finish() { return summaries_.finish(); }

 private:
  bool contextCloses(const ValueMap& message) const {
    if (!isPlaying_) return false;
    if (differsAsText(state_, message, TWReportingMessageKeySelectedFormat) ||
        differsAsText(state_, message, TWReportingMessageKeyActiveDevices)) {
      return true;
    }
    // Leaving a Gather session closes nothing here; a 0 in a stretch that was in none does.
    const Value* gather = message.find(TWReportingMessageKeyGatherSession);
    return gather != nullptr && gather->integer() == 0 && !isInGather(state_);
  }

  void closeStretch(const std::optional<Value>& timestamp) {
    const auto playingTime = summaries_.measure(TWReportingSessionCategory(), stretchStart_, timestamp);
    if (!playingTime || !state_.contains(TWReportingMessageKeyGatherSession)) {
      return summaries_.skip(TWReportingSessionCategory());
    }
    summaries_.add(TWReportingSessionCategory(), summaryOf(*playingTime), kCategoryGather)
        .destinationWorkers = {&TWReportingSessionMetriconWorker::kWorkerClass,
                               &TWReportingSessionSummaryJsonFileWorker::kWorkerClass};
  }

  // What the closing stretch was played with: the state before the message that closes it.
  ValueMap summaryOf(double playingTime) const {
    const auto carried = [this](std::string_view key) { return *state_.find(key); };
    return {{TWReportingMessageKeySelectedFormat, carried(TWReportingMessageKeySelectedFormat)},
            {TWReportingMessageKeyFormatID, carried(TWReportingMessageKeyFormatID)},
            {TWReportingMessageKeyActiveDevices, carried(TWReportingMessageKeyActiveDevices)},
            {TWReportingMessageKeyPlayseconds, IntervalSummaries::seconds(playingTime)},
            {TWReportingMessageKeyChannelsPerFrame, carried(TWReportingMessageKeyChannelsPerFrame)},
            {TWReportingMessageKeyPlaysecondsBucketed, IntervalSummaries::bucketedSeconds(playingTime)},
            {TWReportingMessageKeyMessageIndex, summaries_.nextIndex()}};
  }

  ValueMap state_;  // the latest value of every key
  bool isPlaying_ = false;
  std::optional<Value> stretchStart_;
  IntervalSummaries summaries_;
};

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionGatherMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionGatherMessagesWorker>("TWReportingSessionGatherMessagesWorker");

void TWReportingSessionGatherMessagesWorker::stop() {
  const auto owner = session.lock();
  if (owner == nullptr || owner->messages().empty()) return;
  const TWReportingSessionMessages summaries = createGatherMessages(
      owner->messages(), TWReportingUtilityVolumeMinimumPlayingTime(owner->serviceType()));
  if (summaries.empty()) return;
  defaultLog(TWReportingSessionCategory(), "sending gather event for reporter %lli", owner->reporterID());
  for (const auto& summary : summaries) owner->sendMessage(summary);
}

TWReportingSessionMessages TWReportingSessionGatherMessagesWorker::createGatherMessages(
    const TWReportingSessionMessages& messages, double minimumPlaytime) const {
  debugLog(TWReportingSessionCategory(), "entering createGatherMessages %s", "createGatherMessages");
  const auto owner = session.lock();
  Walk walk(owner == nullptr ? ValueMap() : owner->previousValues(), minimumPlaytime);
  for (const auto& message : messages) walk.step(message->message);
  return walk.finish();
}

}  // namespace tonewerk
