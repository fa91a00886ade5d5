// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"

#include <array>
#include <cassert>
#include <optional>
#include <string_view>

#include "platform/Log.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionWorkerUtility.h"
#include "session/TWReportingUtility.h"
#include "workers/producers/IntervalWalk.h"

namespace tonewerk {
namespace {

constexpr std::array<std::string_view, 2> kKeysToCombine{TWReportingMessageKeySpatialAudioAccessoryFeature,
                                                         TWReportingMessageKeySpatializationEnabled};
constexpr double kMaxPauseSeconds = 5.0;
constexpr IntervalWalk::Kind kKind{.runningKey = TWReportingMessageKeySessionOutputRunning,
                                   .openInterval = IntervalWalk::OpenInterval::kIgnored,
                                   .category = kCategoryVolume,
                                   .function = "createVolumeMessages",
                                   .subject = "volume",
                                   .length = "playingTime"};

ValueMap defaultState() {
  return {{TWReportingMessageKeySelectedFormat, "unknown"},
          {TWReportingMessageKeyActiveDevices, "unknown"},
          {TWReportingMessageKeyFormatID, "unknown"},
          {TWReportingMessageKeySpatialAudioAccessoryFeature, false},
          {TWReportingMessageKeySpatializationEnabled, false},
          {TWReportingMessageKeyRingerState, false},
          {TWReportingMessageKeyChannelsPerFrame, -1}};
}

class VolumeWalk final : public IntervalWalk {
 public:
  VolumeWalk(const LogSite& site, const ValueMap& previousValues, const SharedString* process,
             double minimumPlaytime)
      : IntervalWalk(kKind, site, minimumPlaytime, defaultState(), previousValues), process_(process) {}

 private:
  bool endsInterval(const ValueMap& message) const override {
    return changesText(message, TWReportingMessageKeySelectedFormat) ||
           changesText(message, TWReportingMessageKeyActiveDevices) ||
           changesNumber(message, TWReportingMessageKeySpatializationEnabled) ||
           changesNumber(message, TWReportingMessageKeyRingerState) ||
           changesNumber(message, TWReportingMessageKeyVolume);
  }

  std::optional<ValueMap> summaryOf(const Interval& interval) override {
    if (process_ == nullptr || !state().contains(TWReportingMessageKeyVolume)) return std::nullopt;
    const Value volume = current(TWReportingMessageKeyVolume);
    return ValueMap{
        {TWReportingMessageKeySelectedFormat, current(TWReportingMessageKeySelectedFormat)},
        {TWReportingMessageKeyFormatID, current(TWReportingMessageKeyFormatID)},
        {TWReportingMessageKeyActiveDevices, current(TWReportingMessageKeyActiveDevices)},
        {TWReportingApplicationName, *process_},
        {TWReportingMessageKeyVolume, volume},
        {TWReportingMessageKeyVolumeBucketed,
         TWReportingUtilityBucketNumberToString(volume.number(),
                                                TWReportingUtilityBucketNumberToStringVolumes, 4)
             .value_or("")},
        {TWReportingMessageKeyPlayseconds, interval.length()},
        {TWReportingMessageKeySpatialAudioAccessoryFeature,
         current(TWReportingMessageKeySpatialAudioAccessoryFeature)},
        {TWReportingMessageKeySpatializationEnabled, current(TWReportingMessageKeySpatializationEnabled)},
        {TWReportingMessageKeyRingerState, current(TWReportingMessageKeyRingerState)},
        {TWReportingMessageKeyChannelsPerFrame, current(TWReportingMessageKeyChannelsPerFrame)},
        {TWReportingMessageKeyPlaysecondsBucketed, interval.bucketedLength()},
        {TWReportingMessageKeyMessageIndex, interval.index}};
  }

  bool changesNumber(const ValueMap& message, std::string_view key) const {
    const Value* before = state().find(key);
    const Value* now = message.find(key);
    return before != nullptr && now != nullptr && before->number() != now->number();
  }

  const SharedString* process_;  // null gives no summaries
};

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionVolumeMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionVolumeMessagesWorker>("TWReportingSessionVolumeMessagesWorker");

void TWReportingSessionVolumeMessagesWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
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
  VolumeWalk walk(TWReportingSessionCategory(), owner == nullptr ? ValueMap() : owner->previousValues(),
                  process, minimumPlaytime);
  return walk.summariesOf(
      TWReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaxPauseSeconds));
}

}  // namespace tonewerk
