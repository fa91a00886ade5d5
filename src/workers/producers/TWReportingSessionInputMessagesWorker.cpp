// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionInputMessagesWorker.h"

#include <array>
#include <cassert>
#include <cstddef>
#include <optional>
#include <set>
#include <string>
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
constexpr double kMaxPauseSeconds = 2.0;  // intentionally less than for volume summaries
// When the previous values show input running, that interval has no begin, but the first message finds input
// running.
constexpr IntervalWalk::Kind kKind{.runningKey = TWReportingMessageKeySessionInputRunning,
                                   .openInterval = IntervalWalk::OpenInterval::kNoBegin,
                                   .category = kCategoryInput,
                                   .function = "createInputMessages",
                                   .subject = "input",
                                   .length = "runningTime"};

// A sample rate that begins so is below 1: no vocoder runs.
constexpr std::string_view kNoRate = "0.";

std::string joined(const std::set<std::string>& names) {
  std::string text;
  for (const std::string& name : names) {
    if (!text.empty()) text += ',';
    text += name;
  }
  return text;
}

class InputWalk final : public IntervalWalk {
 public:
  InputWalk(const LogSite& site, ValueMap previousValues, const SharedString* process,
            double minimumRunningtime)
      : IntervalWalk(kKind, site, minimumRunningtime, std::move(previousValues)), process_(process) {}

 private:
  bool endsInterval() override { return activeDevices_.changes(); }

  void collect() override {
    if (!vocoder_.changes()) return;
    const Value* noRate = nullptr;
    const ValueView sampleRate = message().view(TWReportingMessageKeyVpConfigPrimaryVocoderFs);
    const std::string rate = sampleRate ? sampleRate.text() : textOf(noRate);
    if (rate.starts_with(kNoRate)) return;
    vocoders_.insert(vocoder_.now().text() + ":" + rate);
  }

  std::optional<ValueMap> summaryOf(const Interval& interval) override {
    if (process_ == nullptr) return withhold(ReasonTrace::Outcome::kNoApplication);
    ValueMap summary{{TWReportingApplicationName, *process_},
                     {TWReportingMessageKeyInputrunningSeconds, interval.length()},
                     {TWReportingMessageKeyInputrunningSecondsBucketed, interval.bucketedLength()},
                     {TWReportingMessageKeyMessageIndex, interval.index},
                     {TWReportingMessageKeyVpConfigOperationMode, operationMode_.value()},
                     {TWReportingMessageKeyVpConfigInputPort, inputPort_.value()},
                     {TWReportingMessageKeyActiveDevices, activeDevices_.value()}};
    if (!vocoders_.empty()) summary.set(TWReportingMessageKeyVocoders, joined(vocoders_));
    vocoders_.clear();
    return summary;
  }

  const SharedString* process_;     // null gives no summaries
  std::set<std::string> vocoders_;  // the new vocoders since the last summary, each as "name:rate"
  Latest activeDevices_{*this, TWReportingMessageKeyActiveDevices, &kUnknownText};
  Latest vocoder_{*this, TWReportingMessageKeyVpConfigPrimaryVocoder, &kUnknownText};
  Latest operationMode_{*this, TWReportingMessageKeyVpConfigOperationMode, &kUnknownText};
  Latest inputPort_{*this, TWReportingMessageKeyVpConfigInputPort, &kUnknownText};
};

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionInputMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionInputMessagesWorker>("TWReportingSessionInputMessagesWorker");

void TWReportingSessionInputMessagesWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr || owner->messages().empty()) return;
  const SharedString application = owner->applicationName();
  const TWReportingSessionMessages summaries = createInputMessages(
      owner->messages(), &application, TWReportingUtilityVolumeMinimumPlayingTime(owner->serviceType()));
  if (summaries.empty()) return;
  defaultLog(TWReportingSessionCategory(), "sending input summary event for reporter %lli",
             owner->reporterID());
  for (const auto& summary : summaries) owner->sendMessage(summary);
}

TWReportingSessionMessages TWReportingSessionInputMessagesWorker::createInputMessages(
    MessageRange messages, const SharedString* process, double minimumRunningtime) const {
  debugLog(TWReportingSessionCategory(), "entering createInputMessages %s", "createInputMessages");
  const auto owner = session.lock();
  InputWalk walk(TWReportingSessionCategory(), owner == nullptr ? ValueMap() : owner->previousValues(),
                 process, minimumRunningtime);
  const std::vector<std::size_t> merged =
      TWReportingSessionWorkerUtility::mergeRapidMessages(messages, kKeysToCombine, kMaxPauseSeconds);
  TWReportingSessionMessages summaries = walk.summariesOf(messages, merged);
  debugLog(TWReportingSessionCategory(), "returning input messages { func=%s, action=return, count=%lu }",
           "createInputMessages", summaries.size());
  return summaries;
}

}  // namespace tonewerk
