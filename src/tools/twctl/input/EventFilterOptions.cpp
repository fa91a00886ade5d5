// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/EventFilterOptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>

#include "tools/twctl/Tool.h"
#include "tools/twctl/input/ValueArguments.h"

namespace tonewerk {
namespace {

constexpr const char* kAll = "all";

}  // namespace

void EventFilterOptions::refuse(CLI::App& command, std::initializer_list<const char*> options,
                                const std::string& problem) {
  for (const std::string option : options) {
    const std::string name = option.substr(option.rfind(',') + 1);
    command
        .add_option_function<std::string>(
            option, [name, problem](const std::string&) { throw CLI::ValidationError(name, problem); })
        ->group("");  // not in the help
  }
}

void EventFilterOptions::addTo(CLI::App& command, const std::string& what,
                               std::initializer_list<Choice> choices) {
  const auto has = [&](Choice choice) { return std::ranges::find(choices, choice) != choices.end(); };
  const std::string pattern = " that this pattern fits (*, ?, [...])";
  command.footer(std::string(TimeRangeOptions::kForms) + "\nThe store is read whether a daemon runs or not.");
  if (has(Choice::kName)) command.add_option("--name", name_, "Only names" + pattern)->type_name("GLOB");
  range_.addTo(command, what);
  addLimit(command, limit_);
  const std::string unknown = "the store does not know of " + what + " which ";
  if (has(Choice::kApplication)) {
    command.add_option("--app", application_, "Only of applications" + pattern)->type_name("GLOB");
  } else {
    refuse(command, {"--app"}, unknown + "application they are of");
  }
  if (has(Choice::kDevice)) {
    command.add_option("--device", device_, "Only of sessions that played or recorded on such devices")
        ->type_name("GLOB");
  } else {
    refuse(command, {"--device"}, unknown + "session they are of, so it knows no device");
  }
  if (has(Choice::kService)) {
    addService(command, service_, "Only of sessions");
  } else {
    refuse(command, {"--service"}, unknown + "service they are of");
  }
  if (has(Choice::kSession)) {
    command.add_option("--session", session_, "Only of the session of this id in twctl sessions")
        ->type_name("ID")
        ->check(problemWithCount);
  } else {
    refuse(command, {"--session"}, unknown + "session they are of; --since and --until choose its time");
  }
}

std::optional<EventFilter> EventFilterOptions::filter(Tool& tool) const {
  const std::optional<TimeRangeOptions::Range> range = range_.range(tool);
  if (!range) return std::nullopt;
  EventFilter filter;
  filter.name = name_;
  filter.limit = limitOf(limit_);
  filter.since = range->since;
  filter.until = range->until;
  filter.application = application_;
  filter.device = device_;
  filter.service = service_;
  filter.session = session_;
  return filter;
}

CLI::Option& EventFilterOptions::addLimit(CLI::App& command, std::optional<std::string>& limit) {
  return *command.add_option("-n,--limit", limit, "Only the newest so many, or all")
              ->type_name("N")
              ->check([](const std::string& text) { return text == kAll ? "" : problemWithCount(text); });
}

std::optional<std::int64_t> EventFilterOptions::limitOf(const std::optional<std::string>& limit) {
  if (!limit || *limit == kAll) return std::nullopt;
  return valueOfArgument(*limit).integer();
}

CLI::Option& EventFilterOptions::addService(CLI::App& command, std::optional<std::string>& service,
                                            const std::string& what) {
  return *command.add_option("--service", service, what + " for such services, as telephony")
              ->type_name("GLOB")
              ->check(problemWithService);
}

}  // namespace tonewerk
