// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionSummaryWorker.h"

#include <array>
#include <cassert>
#include <string>
#include <string_view>

#include "platform/Log.h"
#include "platform/ProcessInformation.h"
#include "platform/SystemInformation.h"
#include "session/MessageShapes.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

constexpr AudioEventCategory kCategorySessionSummary = kDomainSession | kCategoryGeneric;
const Value kOverload("overload");

// The keys and texts of summaries are made once, because making them takes longer than the rest of a summary.
const SharedString kTotalActiveTime("total_active_time");
const SharedString kActiveCount("active_count");
const SharedString kOverloadCount("overload_count");
const SharedString kAverageActiveTime("average_active_time");
const SharedString kMessageCount("num_messages");
const SharedString kUniqueMessageCount("num_unique_messages");
const SharedString kRedundantMessageCount("num_redundant_messages");
const SharedString kSingleMessageSession("singleMessageSession");
const SharedString kServiceName("summaryServiceName");
const SharedString kClientProcessName("clientProcessName");
const SharedString kThermalState("thermal_state");
const SharedString kLowPowerEnabled("low_power_enabled");
const SharedString kFootprint("vmInfo_phys_footprint_MiB");
const std::array<SharedString, 3> kLoadAverages{"load_avg_1_min", "load_avg_5_min", "load_avg_15_min"};
const std::array<SharedString, 4> kThermalStates{"Nominal", "Fair", "Serious", "Critical"};
const SharedString kUnknown("Unknown");

// The entries of a summary, and those that the session adds to each message.
constexpr std::size_t kEntries = 20;

const SharedString& thermalStateText(int level) {
  const auto place = static_cast<std::size_t>(level);
  return level >= 0 && place < kThermalStates.size() ? kThermalStates[place] : kUnknown;
}

// Only the low 32 bits of the footprint count, as ever: 4 GiB and more wrap.
std::uint32_t mebibytes(std::uint64_t bytes) { return static_cast<std::uint32_t>(bytes) >> 20; }

void addDeviceState(ValueMap& summary) {
  const Platform& platform = TWReportingContext::current().platform();
  summary.add(kThermalState, thermalStateText(platform.system.thermalLevel()));
  summary.add(kLowPowerEnabled, platform.system.isLowPowerModeEnabled() ? 1 : 0);
  const auto footprint = platform.processes.physicalFootprint();
  if (const auto* bytes = std::get_if<std::uint64_t>(&footprint)) {
    summary.add(kFootprint, mebibytes(*bytes));
  } else {
    errorLog(TWReportingSummaryLogCategory(), "Error with task_info(): %s", std::get<std::string>(footprint));
  }
  const std::array<double, 3> loads = platform.system.loadAverages();
  for (std::size_t at = 0; at < loads.size(); ++at) summary.add(kLoadAverages[at], loads[at]);
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionSummaryWorker::kWorkerClass =
    workerClassOf<TWReportingSessionSummaryWorker>("TWReportingSessionSummaryWorker");

bool TWReportingSessionSummaryWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (const ValueView duration = knownValue(message.message, KnownKey::kSessionDuration)) {
    totalActiveTime_ += duration.number();
    ++activeCount_;
    if (const auto owner = session.lock()) owner->countActivity(duration.number());
    return false;
  }
  const ValueView issueType = knownValue(message.message, KnownKey::kIssueType);
  if (!issueType || !(issueType == ValueView(kOverload))) return false;
  ++overloadCount_;
  if (const auto owner = session.lock()) owner->countOverload();
  return false;
}

void TWReportingSessionSummaryWorker::stop() {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  const auto owner = session.lock();
  if (owner == nullptr) return;
  owner->sendMessage(
      std::make_shared<TWReportingSessionMessage>(summaryOf(*owner), kCategorySessionSummary, kTypeSummary));
}

ValueMap TWReportingSessionSummaryWorker::summaryOf(const TWReportingSession& owner) const {
  const std::uint64_t received = owner.totalMessageCount();
  const std::uint64_t stored = owner.messages().size();
  ValueMap summary;
  summary.reserve(kEntries);
  summary.add(kTotalActiveTime, totalActiveTime_);
  summary.add(kActiveCount, activeCount_);
  summary.add(kOverloadCount, overloadCount_);
  summary.add(kAverageActiveTime, activeCount_ == 0 ? 0.0 : totalActiveTime_ / activeCount_);
  summary.add(kMessageCount, received);
  summary.add(kUniqueMessageCount, stored);
  // An approximation: wraps when more are stored than were received.
  summary.add(kRedundantMessageCount, received - stored);
  summary.add(kSingleMessageSession, owner.isSingleMessageSession());
  summary.add(kServiceName, owner.serviceName());
  summary.add(TWReportingApplicationName, owner.applicationName());
  if (const auto name = owner.clientProcessName()) summary.add(kClientProcessName, *name);
  // A session that is recovered ended before the crash, when the device was in another state.
  if (!TWReportingContext::current().journal().isRecovering()) addDeviceState(summary);
  return summary;
}

}  // namespace tonewerk
