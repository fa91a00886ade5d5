// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionSummaryWorker.h"

#include <array>
#include <cassert>
#include <string>
#include <string_view>

#include "platform/Log.h"
#include "platform/ProcessInformation.h"
#include "platform/SystemInformation.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

constexpr AudioEventCategory kCategorySessionSummary = kDomainSession | kCategoryGeneric;
const Value kOverload("overload");

std::string_view thermalStateText(int level) {
  constexpr std::array<std::string_view, 4> kTexts{"Nominal", "Fair", "Serious", "Critical"};
  return level >= 0 && level < 4 ? kTexts[static_cast<std::size_t>(level)] : "Unknown";
}

// Only the low 32 bits of the footprint count, as ever: 4 GiB and more wrap.
std::uint32_t mebibytes(std::uint64_t bytes) { return static_cast<std::uint32_t>(bytes) >> 20; }

void addDeviceState(ValueMap& summary) {
  const Platform& platform = TWReportingContext::current().platform();
  summary.set("thermal_state", thermalStateText(platform.system.thermalLevel()));
  summary.set("low_power_enabled", platform.system.isLowPowerModeEnabled() ? 1 : 0);
  const auto footprint = platform.processes.physicalFootprint();
  if (const auto* bytes = std::get_if<std::uint64_t>(&footprint)) {
    summary.set("vmInfo_phys_footprint_MiB", mebibytes(*bytes));
  } else {
    errorLog(TWReportingSummaryLogCategory(), "Error with task_info(): %s", std::get<std::string>(footprint));
  }
  const std::array<double, 3> loads = platform.system.loadAverages();
  summary.set("load_avg_1_min", loads[0]);
  summary.set("load_avg_5_min", loads[1]);
  summary.set("load_avg_15_min", loads[2]);
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionSummaryWorker::kWorkerClass =
    workerClassOf<TWReportingSessionSummaryWorker>("TWReportingSessionSummaryWorker");

bool TWReportingSessionSummaryWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (const ValueView duration = message.message.view(TWReportingMessageKeySessionDuration)) {
    totalActiveTime_ += duration.number();
    ++activeCount_;
    return false;
  }
  const ValueView issueType = message.message.view(TWReportingMessageKeyIssueType);
  if (issueType && issueType == ValueView(kOverload)) ++overloadCount_;
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
  ValueMap summary{
      {"total_active_time", totalActiveTime_},
      {"active_count", activeCount_},
      {"overload_count", overloadCount_},
      {"average_active_time", activeCount_ == 0 ? 0.0 : totalActiveTime_ / activeCount_},
      {"num_messages", received},
      {"num_unique_messages", stored},
      {"num_redundant_messages",
       received - stored},  // an approximation: wraps when more are stored than were received
      {"singleMessageSession", owner.isSingleMessageSession()},
      {"summaryServiceName", owner.serviceName()},
      {TWReportingApplicationName, TWReportingUtilityRetrieveAppName(owner.configuration())},
  };
  if (const auto name = owner.clientProcessName()) summary.set("clientProcessName", *name);
  addDeviceState(summary);
  return summary;
}

}  // namespace tonewerk
