// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionVolumeMessagesWorker.h"

#include <array>
#include <cassert>
#include <cstddef>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

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

class VolumeWalk final : public IntervalWalk {
 public:
  VolumeWalk(const LogSite& site, ValueMap previousValues, const SharedString* process,
             double minimumPlaytime)
      : IntervalWalk(kKind, site, minimumPlaytime, std::move(previousValues)), process_(process) {}

 private:
  bool endsInterval() override {
    return selectedFormat_.changesText() || activeDevices_.changesText() || spatialization_.changesNumber() ||
           ringerState_.changesNumber() || volume_.changesNumber();
  }

  std::optional<ValueMap> summaryOf(const Interval& interval) override {
    const ValueView volume = volume_.find();
    if (process_ == nullptr) return withhold(ReasonTrace::Outcome::kNoApplication);
    if (!volume) return withhold(ReasonTrace::Outcome::kNoVolume);
    return ValueMap{{TWReportingMessageKeySelectedFormat, selectedFormat_.value()},
                    {TWReportingMessageKeyFormatID, formatID_.value()},
                    {TWReportingMessageKeyActiveDevices, activeDevices_.value()},
                    {TWReportingApplicationName, *process_},
                    {TWReportingMessageKeyVolume, volume.value()},
                    {TWReportingMessageKeyVolumeBucketed,
                     TWReportingUtilityBucketNumberToString(volume.number(),
                                                            TWReportingUtilityBucketNumberToStringVolumes, 4)
                         .value_or("")},
                    {TWReportingMessageKeyPlayseconds, interval.length()},
                    {TWReportingMessageKeySpatialAudioAccessoryFeature, accessoryFeature_.value()},
                    {TWReportingMessageKeySpatializationEnabled, spatialization_.value()},
                    {TWReportingMessageKeyRingerState, ringerState_.value()},
                    {TWReportingMessageKeyChannelsPerFrame, channels_.value()},
                    {TWReportingMessageKeyPlaysecondsBucketed, interval.bucketedLength()},
                    {TWReportingMessageKeyMessageIndex, interval.index}};
  }

  const SharedString* process_;  // null gives no summaries
  Latest selectedFormat_{*this, TWReportingMessageKeySelectedFormat, &kUnknownText};
  Latest activeDevices_{*this, TWReportingMessageKeyActiveDevices, &kUnknownText};
  Latest spatialization_{*this, TWReportingMessageKeySpatializationEnabled, &kFalse};
  Latest ringerState_{*this, TWReportingMessageKeyRingerState, &kFalse};
  Latest volume_{*this, TWReportingMessageKeyVolume};
  Latest formatID_{*this, TWReportingMessageKeyFormatID, &kUnknownText};
  Latest accessoryFeature_{*this, TWReportingMessageKeySpatialAudioAccessoryFeature, &kFalse};
  Latest channels_{*this, TWReportingMessageKeyChannelsPerFrame, &kMinusOne};
};

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionVolumeMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionVolumeMessagesWorker>("TWReportingSessionVolumeMessagesWorker");

void TWReportingSessionVolumeMessagesWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || owner->messages().empty()) return;
  const SharedString application = owner->applicationName();
  const TWReportingSessionMessages summaries = createVolumeMessages(
      owner->messages(), &application, TWReportingUtilityVolumeMinimumPlayingTime(owner->serviceType()));
  if (summaries.empty()) return;
  defaultLog(TWReportingSessionCategory(), "sending volume event for reporter %lli", owner->reporterID());
  for (const auto& summary : summaries) owner->sendMessage(summary);
}

TWReportingSessionMessages TWReportingSessionVolumeMessagesWorker::createVolumeMessages(
    MessageRange messages, const SharedString* process, double minimumPlaytime) const {
  debugLog(TWReportingSessionCategory(), "entering createVolumeMessages %s", "createVolumeMessages");
  const auto owner = session.lock();
  VolumeWalk walk(TWReportingSessionCategory(), owner == nullptr ? ValueMap() : owner->previousValues(),
                  process, minimumPlaytime);
  const std::vector<std::size_t> merged =
      TWReportingSessionWorkerUtility::mergeRapidMessages(messages, kKeysToCombine, kMaxPauseSeconds);
  return walk.summariesOf(messages, merged);
}

}  // namespace tonewerk
