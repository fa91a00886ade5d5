// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"

#include <array>
#include <optional>
#include <string_view>

#include "platform/Log.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionWorkerUtility.h"
#include "session/TWReportingUtility.h"
#include "workers/producers/IntervalSummaries.h"

namespace tonewerk {
namespace {

constexpr std::array<std::string_view, 2> kKeysToCombine{TWReportingMessageKeySpatialAudioAccessoryFeature,
                                                         TWReportingMessageKeySpatializationEnabled};
constexpr double kMaxPauseSeconds = 5.0;
constexpr IntervalSummaries::Words kWords{"createVolumeMessages", "volume", "playingTime"};

ValueMap defaultState() {
  return {{TWReportingMessageKeySelectedFormat, "unknown"},
          {TWReportingMessageKeyActiveDevices, "unknown"},
          {TWReportingMessageKeyFormatID, "unknown"},
          {TWReportingMessageKeySpatialAudioAccessoryFeature, false},
          {TWReportingMessageKeySpatializationEnabled, false},
          {TWReportingMessageKeyRingerState, false},
          {TWReportingMessageKeyChannelsPerFrame, -1}};
}

bool differsAsText(const ValueMap& state, const ValueMap& message, std::string_view key) {
  const Value* before = state.find(key);
  const Value* now = message.find(key);
  return before != nullptr && now != nullptr && before->text() != now->text();
}

bool differsAsNumber(const ValueMap& state, const ValueMap& message, std::string_view key) {
  const Value* before = state.find(key);
  const Value* now = message.find(key);
  return before != nullptr && now != nullptr && before->number() != now->number();
}

bool contextDiffers(const ValueMap& state, const ValueMap& message) {
  return differsAsText(state, message, TWReportingMessageKeySelectedFormat) ||
         differsAsText(state, message, TWReportingMessageKeyActiveDevices) ||
         differsAsNumber(state, message, TWReportingMessageKeySpatializationEnabled) ||
         differsAsNumber(state, message, TWReportingMessageKeyRingerState) ||
         differsAsNumber(state, message, TWReportingMessageKeyVolume);
}

// One walk over a session's messages.
class Walk {
 public:
  Walk(const ValueMap& previousValues, const SharedString* process, double minimumPlaytime)
      : process_(process), state_(defaultState()), summaries_(kWords, minimumPlaytime) {
    state_.merge(previousValues);
    isPlaying_ = state_.boolean(TWReportingMessageKeySessionOutputRunning);
    if (!isPlaying_) return;
    // A stretch that the previous values show as open yields no summary by itself: without the key, the first
    // message finds no output running.
    stretchStart_ = IntervalSummaries::timestampOf(state_);
    state_.erase(TWReportingMessageKeySessionOutputRunning);
  }

  void step(const ValueMap& message) {
    const std::optional<Value> timestamp = IntervalSummaries::timestampOf(message);
    const bool wasPlaying = state_.boolean(TWReportingMessageKeySessionOutputRunning);
    const bool isLast = message.contains(TWReportingMessageKeySessionDuration);
    bool changed = isLast;
    if (const Value* running = message.find(TWReportingMessageKeySessionOutputRunning)) {
      isPlaying_ = running->boolean();
      if (!wasPlaying && isPlaying_) stretchStart_ = timestamp;
      if (wasPlaying && !isPlaying_) changed = true;
    } else if (isLast) {
      isPlaying_ = false;
    }
    if (isPlaying_ && contextDiffers(state_, message)) changed = true;
    if (wasPlaying && changed) {
      closeStretch(timestamp);
      stretchStart_ = timestamp;  // of the next one, when output keeps running
    }
    if (!isPlaying_) stretchStart_.reset();
    state_.merge(message);
  }

  TWReportingSessionMessages finish() { return summaries_.finish(); }

 private:
  void closeStretch(const std::optional<Value>& timestamp) {
    const auto playingTime = summaries_.measure(TWReportingSessionCategory(), stretchStart_, timestamp);
    if (!playingTime || process_ == nullptr || !state_.contains(TWReportingMessageKeyVolume)) {
      return summaries_.skip(TWReportingSessionCategory());
    }
    summaries_.add(TWReportingSessionCategory(), summaryOf(*playingTime), kCategoryVolume);
  }

  // What the closing stretch was played with: the state before the message that closes it.
  ValueMap summaryOf(double playingTime) const {
    const auto carried = [this](std::string_view key) { return *state_.find(key); };
    const Value volume = carried(TWReportingMessageKeyVolume);
    return {{TWReportingMessageKeySelectedFormat, carried(TWReportingMessageKeySelectedFormat)},
            {TWReportingMessageKeyFormatID, carried(TWReportingMessageKeyFormatID)},
            {TWReportingMessageKeyActiveDevices, carried(TWReportingMessageKeyActiveDevices)},
            {TWReportingApplicationName, *process_},
            {TWReportingMessageKeyVolume, volume},
            {TWReportingMessageKeyVolumeBucketed,
             TWReportingUtilityBucketNumberToString(volume.number(),
                                                    TWReportingUtilityBucketNumberToStringVolumes, 4)
                 .value_or("")},
            {TWReportingMessageKeyPlayseconds, IntervalSummaries::seconds(playingTime)},
            {TWReportingMessageKeySpatialAudioAccessoryFeature,
             carried(TWReportingMessageKeySpatialAudioAccessoryFeature)},
            {TWReportingMessageKeySpatializationEnabled, carried(TWReportingMessageKeySpatializationEnabled)},
            {TWReportingMessageKeyRingerState, carried(TWReportingMessageKeyRingerState)},
            {TWReportingMessageKeyChannelsPerFrame, carried(TWReportingMessageKeyChannelsPerFrame)},
            {TWReportingMessageKeyPlaysecondsBucketed, IntervalSummaries::bucketedSeconds(playingTime)},
            {TWReportingMessageKeyMessageIndex, summaries_.nextIndex()}};
  }

  const SharedString* process_;
  ValueMap state_;  // the latest value of every key
  bool isPlaying_ = false;
  std::optional<Value> stretchStart_;
  IntervalSummaries summaries_;
};

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionVolumeMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionVolumeMessagesWorker>("TWReportingSessionVolumeMessagesWorker");

void TWReportingSessionVolumeMessagesWorker::stop() {
  const auto owner = session.lock();
  if (owner == nullptr || owner->messages().empty()) return;
  const SharedString application = TWReportingUtilityRetrieveAppName(owner->configuration());
  const TWReportingSessionMessages summaries = createVolumeMessages(
      owner->messages(), &application, TWReportingUtilityVolumeMinimumPlayingTime(owner->serviceType()));
  if (summaries.empty()) return;
  defaultLog(TWReportingSessionCategory(), "sending volume event for reporter %lli", owner->reporterID());
  for (const auto& summary : summaries) owner->sendMessage(summary);
}

TWReportingSessionMessages TWReportingSessionVolumeMessagesWorker::createVolumeMessages(
    const TWReportingSessionMessages& messages, const SharedString* process, double minimumPlaytime) const {
  debugLog(TWReportingSessionCategory(), "entering createVolumeMessages %s", "createVolumeMessages");
  const auto owner = session.lock();
  Walk walk(owner == nullptr ? ValueMap() : owner->previousValues(), process, minimumPlaytime);
  for (const auto& message :
       TWReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaxPauseSeconds)) {
    walk.step(message->message);
  }
  return walk.finish();
}

}  // namespace tonewerk
