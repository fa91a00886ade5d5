// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionGatherMessagesWorker.h"

#include <cassert>
#include <optional>
#include <string_view>

#include "platform/Log.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "workers/producers/IntervalWalk.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"
#include "workers/sinks/TWReportingSessionSummaryJsonFileWorker.h"

namespace tonewerk {
namespace {

constexpr IntervalWalk::Kind kKind{.runningKey = TWReportingMessageKeySessionOutputRunning,
                                   .openInterval = IntervalWalk::OpenInterval::kContinues,
                                   .category = kCategoryGather,
                                   .function = "createGatherMessages",
                                   .subject = "gather",
                                   .length = "playingTime"};

ValueMap defaultState() {
  return {{TWReportingMessageKeySelectedFormat, "unknown"},
          {TWReportingMessageKeyActiveDevices, "unknown"},
          {TWReportingMessageKeyFormatID, "unknown"},
          {TWReportingMessageKeyChannelsPerFrame, -1}};
}

bool isInGather(const ValueMap& map) { return map.integer(TWReportingMessageKeyGatherSession) == 1; }

class GatherWalk final : public IntervalWalk {
 public:
  GatherWalk(const LogSite& site, const ValueMap& previousValues, double minimumPlaytime)
      : IntervalWalk(kKind, site, minimumPlaytime, defaultState(), previousValues) {}

 private:
  bool begins(const ValueMap& message) const override { return isInGather(message); }

  bool endsInterval(const ValueMap& message) const override {
    // A further start of output that is not in a Gather session ends an interval that is in one.
    if (message.contains(TWReportingMessageKeySessionOutputRunning) && isInGather(state()) &&
        !isInGather(message)) {
      return true;
    }
    if (changesText(message, TWReportingMessageKeySelectedFormat) ||
        changesText(message, TWReportingMessageKeyActiveDevices)) {
      return true;
    }
    // A 0 without a start of output ends no interval in a Gather session. It ends one that is in none.
    const Value* gather = message.find(TWReportingMessageKeyGatherSession);
    return gather != nullptr && gather->integer() == 0 && !isInGather(state());
  }

  std::optional<ValueMap> summaryOf(const Interval& interval) override {
    if (!state().contains(TWReportingMessageKeyGatherSession)) return std::nullopt;
    return ValueMap{{TWReportingMessageKeySelectedFormat, current(TWReportingMessageKeySelectedFormat)},
                    {TWReportingMessageKeyFormatID, current(TWReportingMessageKeyFormatID)},
                    {TWReportingMessageKeyActiveDevices, current(TWReportingMessageKeyActiveDevices)},
                    {TWReportingMessageKeyPlayseconds, interval.length()},
                    {TWReportingMessageKeyChannelsPerFrame, current(TWReportingMessageKeyChannelsPerFrame)},
                    {TWReportingMessageKeyPlaysecondsBucketed, interval.bucketedLength()},
                    {TWReportingMessageKeyMessageIndex, interval.index}};
  }
};

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionGatherMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionGatherMessagesWorker>("TWReportingSessionGatherMessagesWorker");

void TWReportingSessionGatherMessagesWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
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
  GatherWalk walk(TWReportingSessionCategory(), owner == nullptr ? ValueMap() : owner->previousValues(),
                  minimumPlaytime);
  TWReportingSessionMessages summaries = walk.summariesOf(messages);
  for (const auto& summary : summaries) {
    summary->destinationWorkers = {&TWReportingSessionMetriconWorker::kWorkerClass,
                                   &TWReportingSessionSummaryJsonFileWorker::kWorkerClass};
  }
  return summaries;
}

}  // namespace tonewerk
