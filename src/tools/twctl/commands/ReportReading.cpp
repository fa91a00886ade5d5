// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/ReportReading.h"

#include <CLI/CLI.hpp>
#include <array>
#include <chrono>
#include <climits>
#include <unistd.h>
#include <utility>

#include "tools/twctl/Tool.h"
#include "tools/twctl/commands/RecordedDevice.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/report/DaemonHealth.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr const char* kHappened = "what happened";

std::string hostName() {
  std::array<char, HOST_NAME_MAX + 1> name{};
  return gethostname(name.data(), name.size() - 1) == 0 ? name.data() : "";
}

ValueMap filterOf(const ReportScope& scope) {
  ValueMap filter;
  if (scope.since) filter.set("since", *scope.since);
  if (scope.until) filter.set("until", *scope.until);
  if (scope.application) filter.set("application", *scope.application);
  return filter;
}

}  // namespace

void ReportScopeOptions::addTo(CLI::App& command) {
  addChoice(command);
  range_.addTo(command, kHappened);
}

void ReportScopeOptions::addOpenEndTo(CLI::App& command) {
  addChoice(command);
  range_.addSinceTo(command, kHappened);
}

void ReportScopeOptions::addChoice(CLI::App& command) {
  command
      .add_option("--session", session_,
                  "Only this session: the id of the store's view session, which the page shows as #ID")
      ->type_name("ID")
      ->check(problemWithCount);
  command.add_option("--app", application_, "Only applications that this pattern fits (*, ?, [...])")
      ->type_name("GLOB");
}

std::optional<ReportScope> ReportScopeOptions::scope(Tool& tool) const {
  const std::optional<TimeRangeOptions::Range> range = range_.range(tool);
  if (!range) return std::nullopt;
  ReportScope scope;
  scope.since = range->since;
  scope.until = range->until;
  scope.application = application_;
  scope.session = session_;
  return scope;
}

ValueMap reportedDevice(const Tool& tool) {
  ValueMap device{{"host", hostName()}};
  const ValueMap recorded = recordedDevice(tool, geteuid());
  const Value* preferences = recorded.find("preferences");
  const Value* domain = preferences == nullptr ? nullptr : preferences->asMap()->find("com.orvane.tonewerk");
  if (domain != nullptr && domain->asMap()->contains("device_name"))
    device.set("name", domain->asMap()->text("device_name"));
  return device;
}

ReportData readReport(const Tool& tool, const ReportScope& scope, const ValueMap& device) {
  const double now =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  ValueMap daemon = daemonHealth(tool, scope.stop);
  ReportScope told = scope;
  told.daemonAnswers = daemon.boolean("answers");
  ReportData report = ReportData::read(tool.directories().state, told, now);
  if (!report.problem.empty()) return report;
  report.data.set("version", TONEWERK_VERSION);
  report.data.set("device", device);
  report.data.set("filter", filterOf(scope));
  report.data.set("daemon", std::move(daemon));
  return report;
}

}  // namespace tonewerk
