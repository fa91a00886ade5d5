// SPDX-License-Identifier: Apache-2.0
#include "workers/producers/TWReportingSessionInputMessagesWorker.h"

#include <array>
#include <optional>
#include <set>
#include <string>
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
constexpr double kMaxPauseSeconds = 2.0;  // less than for volume summaries, on purpose
constexpr IntervalSummaries::Words kWords{"createInputMessages", "input", "runningTime"};

// A sample rate below 1: no vocoder runs.
constexpr std::string_view kNoRate = "0.";

ValueMap defaultState() {
  return {{TWReportingMessageKeySelectedFormat, "unknown"},
          {TWReportingMessageKeyActiveDevices, "unknown"},
          {TWReportingMessageKeyFormatID, "unknown"},
          {TWReportingMessageKeyVpConfigOperationMode, "unknown"},
          {TWReportingMessageKeyVpConfigInputPort, "unknown"},
          {TWReportingMessageKeyVpConfigPrimaryVocoderFs, "unknown"},
          {TWReportingMessageKeyVpConfigPrimaryVocoder, "unknown"}};
}

std::string joined(const std::set<std::string>& names) {
  std::string text;
  for (const std::string& name : names) {
    if (!text.empty()) text += ',';
    text += name;
  }
  return text;
}

// One walk over a session's messages.
class Walk {
 public:
  // No stretch is open at first, whatever the previous values say. If they say that input runs, the first
  // message finds it running, so a stretch is only begun by a change of devices or a stop and another start.
  Walk(const ValueMap& previousValues, const SharedString* process, double minimumRunningtime)
      : process_(process), state_(defaultState()), summaries_(kWords, minimumRunningtime) {
    state_.merge(previousValues);
  }

  void step(const ValueMap& message) {
    const std::optional<Value> timestamp = IntervalSummaries::timestampOf(message);
    const bool wasRunning = state_.boolean(TWReportingMessageKeySessionInputRunning);
    const bool isLast = message.contains(TWReportingMessageKeySessionDuration);
    bool changed = isLast;
    if (const Value* running = message.find(TWReportingMessageKeySessionInputRunning)) {
      isRunning_ = running->boolean();
      if (!wasRunning && isRunning_) stretchStart_ = timestamp;
      if (wasRunning && !isRunning_) changed = true;
    } else if (isLast) {
      isRunning_ = false;
    }
    if (isRunning_) {
      if (hasChanged(message, TWReportingMessageKeyActiveDevices)) changed = true;
      collectVocoder(message);
    }
    if (wasRunning && changed) {
      closeStretch(timestamp);
      stretchStart_ = timestamp;  // of the next one, when input keeps running
    }
    if (!isRunning_) stretchStart_.reset();
    state_.merge(message);
  }

  TWReportingSessionMessages finish() { return summaries_.finish(); }

 private:
  bool hasChanged(const ValueMap& message, std::string_view key) const {
    return TWReportingUtilityKeyIsPresentAndHasChanged(key, &message, &state_);
  }

  void collectVocoder(const ValueMap& message) {
    if (!hasChanged(message, TWReportingMessageKeyVpConfigPrimaryVocoder)) return;
    const std::string rate = textOf(message.find(TWReportingMessageKeyVpConfigPrimaryVocoderFs));
    if (rate.starts_with(kNoRate)) return;
    vocoders_.insert(message.text(TWReportingMessageKeyVpConfigPrimaryVocoder) + ":" + rate);
  }

  void closeStretch(const std::optional<Value>& timestamp) {
    const auto runningTime = summaries_.measure(TWReportingSessionCategory(), stretchStart_, timestamp);
    if (!runningTime || process_ == nullptr) return summaries_.skip(TWReportingSessionCategory());
    summaries_.add(TWReportingSessionCategory(), summaryOf(*runningTime), kCategoryInput);
    vocoders_.clear();
  }

  // What the closing stretch ran with: the state before the message that closes it.
  ValueMap summaryOf(double runningTime) const {
    const auto carried = [this](std::string_view key) { return *state_.find(key); };
    ValueMap summary{
        {TWReportingApplicationName, *process_},
        {TWReportingMessageKeyInputrunningSeconds, IntervalSummaries::seconds(runningTime)},
        {TWReportingMessageKeyInputrunningSecondsBucketed, IntervalSummaries::bucketedSeconds(runningTime)},
        {TWReportingMessageKeyMessageIndex, summaries_.nextIndex()},
        {TWReportingMessageKeyVpConfigOperationMode, carried(TWReportingMessageKeyVpConfigOperationMode)},
        {TWReportingMessageKeyVpConfigInputPort, carried(TWReportingMessageKeyVpConfigInputPort)},
        {TWReportingMessageKeyActiveDevices, carried(TWReportingMessageKeyActiveDevices)}};
    if (!vocoders_.empty()) summary.set(TWReportingMessageKeyVocoders, joined(vocoders_));
    return summary;
  }

  const SharedString* process_;
  ValueMap state_;  // the latest value of every key
  bool isRunning_ = false;
  std::optional<Value> stretchStart_;
  std::set<std::string> vocoders_;  // changed to since the last summary, each as "name:rate"
  IntervalSummaries summaries_;
};

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionInputMessagesWorker::kWorkerClass =
    workerClassOf<TWReportingSessionInputMessagesWorker>("TWReportingSessionInputMessagesWorker");

void TWReportingSessionInputMessagesWorker::stop() {
  const auto owner = session.lock();
  if (owner == nullptr || owner->messages().empty()) return;
  const SharedString application = TWReportingUtilityRetrieveAppName(owner->configuration());
  const TWReportingSessionMessages summaries = createInputMessages(
      owner->messages(), &application, TWReportingUtilityVolumeMinimumPlayingTime(owner->serviceType()));
  if (summaries.empty()) return;
  defaultLog(TWReportingSessionCategory(), "sending input summary event for reporter %lli",
             owner->reporterID());
  for (const auto& summary : summaries) owner->sendMessage(summary);
}

TWReportingSessionMessages TWReportingSessionInputMessagesWorker::createInputMessages(
    const TWReportingSessionMessages& messages, const SharedString* process,
    double minimumRunningtime) const {
  debugLog(TWReportingSessionCategory(), "entering createInputMessages %s", "createInputMessages");
  const auto owner = session.lock();
  Walk walk(owner == nullptr ? ValueMap() : owner->previousValues(), process, minimumRunningtime);
  for (const auto& message :
       TWReportingSessionWorkerUtility::combineRapidMessages(messages, kKeysToCombine, kMaxPauseSeconds)) {
    walk.step(message->message);
  }
  TWReportingSessionMessages summaries = walk.finish();
  debugLog(TWReportingSessionCategory(), "returning input messages { func=%s, action=return, count=%lu }",
           "createInputMessages", summaries.size());
  return summaries;
}

}  // namespace tonewerk
