// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionGatherMessagesWorker.h"

#include <cassert>
#include <optional>
#include <utility>

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

class GatherWalk final : public IntervalWalk {
 public:
  GatherWalk(const LogSite& site, ValueMap previousValues, double minimumPlaytime)
      : IntervalWalk(kKind, site, minimumPlaytime, std::move(previousValues)) {}

 private:
  static bool isInGather(ValueView gather) { return gather.integer() == 1; }

  bool begins() override { return isInGather(gather_.now()); }
  std::string_view beginKey() const override { return gather_.name(); }

  bool endsInterval() override {
    // A further start of output that is not in a Gather session ends an interval that is in one.
    if (saysRunning() && isInGather(gather_.find()) && !isInGather(gather_.now())) return endsBy(gather_);
    if (selectedFormat_.changesText() || activeDevices_.changesText()) return true;
    // A 0 without a start of output ends no interval in a Gather session. It ends one that is in none.
    const ValueView gather = gather_.now();
    return gather && gather.integer() == 0 && !isInGather(gather_.find()) && endsBy(gather_);
  }

  std::optional<ValueMap> summaryOf(const Interval& interval) override {
    if (!gather_.find()) return withhold(ReasonTrace::Outcome::kNotInGather);
    return ValueMap{{TWReportingMessageKeySelectedFormat, selectedFormat_.value()},
                    {TWReportingMessageKeyFormatID, formatID_.value()},
                    {TWReportingMessageKeyActiveDevices, activeDevices_.value()},
                    {TWReportingMessageKeyPlayseconds, interval.length()},
                    {TWReportingMessageKeyChannelsPerFrame, channels_.value()},
                    {TWReportingMessageKeyPlaysecondsBucketed, interval.bucketedLength()},
                    {TWReportingMessageKeyMessageIndex, interval.index}};
  }

  Latest gather_{*this, TWReportingMessageKeyGatherSession};
  Latest selectedFormat_{*this, TWReportingMessageKeySelectedFormat, &kUnknownText};
  Latest activeDevices_{*this, TWReportingMessageKeyActiveDevices, &kUnknownText};
  Latest formatID_{*this, TWReportingMessageKeyFormatID, &kUnknownText};
  Latest channels_{*this, TWReportingMessageKeyChannelsPerFrame, &kMinusOne};
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
    MessageRange messages, double minimumPlaytime) const {
  debugLog(TWReportingSessionCategory(), "entering createGatherMessages %s", "createGatherMessages");
  const auto owner = session.lock();
  GatherWalk walk(TWReportingSessionCategory(), owner == nullptr ? ValueMap() : owner->previousValues(),
                  minimumPlaytime);
  TWReportingSessionMessages summaries = walk.summariesOf(messages);
  for (const auto& summary : summaries) {
    summary->details.setDestinationWorkers({&TWReportingSessionMetriconWorker::kWorkerClass,
                                            &TWReportingSessionSummaryJsonFileWorker::kWorkerClass});
  }
  return summaries;
}

}  // namespace tonewerk
