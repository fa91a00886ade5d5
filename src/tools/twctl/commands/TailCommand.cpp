// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "protocol/EventTexts.h"
#include "protocol/Requests.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/Pattern.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/LiveEvents.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/MessagePrinter.h"

namespace tonewerk {
namespace {

struct TailOptions {
  std::vector<ReporterID> reporterIDs;
  std::optional<std::string> category;
  std::optional<std::string> type;
  std::optional<std::string> application;
  std::optional<std::string> device;
  std::optional<std::string> service;
  std::int64_t count = std::numeric_limits<std::int64_t>::max();
};

// Whether the message is of a session that the options choose, which the daemon does not do.
bool isWanted(const TailOptions& options, const ValueMap& message) {
  const auto service = static_cast<AudioServiceType>(message.integer(kWatchKeyServiceType));
  return fitsPattern(options.service, TWReportingUtilityGenerateServiceNameFromServiceType(service)) &&
         fitsPattern(options.application, message.text(kWatchKeyApplication)) &&
         fitsPattern(options.device, message.text(kWatchKeyDevice));
}

Argument listOf(const std::vector<ReporterID>& numbers) {
  if (numbers.empty()) return std::nullopt;
  return ValueArray(std::vector<Value>(numbers.begin(), numbers.end()));
}

// The parameters of watch.openMessages. None when an option is wrong, with the reason in `problem`.
std::optional<Arguments> filterOf(const TailOptions& options, std::string& problem) {
  Arguments filter{listOf(options.reporterIDs), std::nullopt, std::nullopt};
  if (options.category) {
    const auto category = categoryOfArgument(*options.category);
    if (!category) problem = unknownCategory(*options.category);
    if (!category) return std::nullopt;
    filter[1] = ValueArray{*category};
  }
  if (options.type) {
    const auto type = typeOfArgument(*options.type);
    if (!type) problem = unknownType(*options.type);
    if (!type) return std::nullopt;
    filter[2] = ValueArray{*type};
  }
  return filter;
}

// Prints at most `left` messages of an answer of watch.nextMessages, and subtracts their number from `left`.
void print(const Tool& tool, const TailOptions& options, const ValueMap& answer, std::int64_t& left) {
  const MessagePrinter printer(tool);
  const std::int64_t missed = answer.integer(kWatchKeyMissed);
  if (missed > 0) printer.printMissed(static_cast<std::uint64_t>(missed));
  const Value* list = answer.find(kWatchKeyMessages);
  if (list != nullptr && list->asArray() != nullptr) {
    for (const Value& message : *list->asArray()) {
      if (left == 0) break;
      if (message.asMap() == nullptr || !isWanted(options, *message.asMap())) continue;
      printer.print(*message.asMap());
      --left;
    }
  }
  tool.out.flush();
}

void tail(Tool& tool, const TailOptions& options) {
  std::string problem;
  const std::optional<Arguments> filter = filterOf(options, problem);
  if (!filter) {
    tool.status = tool.fail(kWrongUsage, problem);
    return;
  }
  DaemonCalls daemon(tool);
  if (!daemon.connect(DaemonCalls::Role::kOnlooker)) return;
  LiveEvents events(-1, tool.outDescriptor);
  const auto waitReadable = [&events](int descriptor) {
    LiveEvents::Event event{};
    do {
      event = events.wait(descriptor, std::nullopt);
    } while (event == LiveEvents::Event::kResized);
    return event == LiveEvents::Event::kReadable;
  };
  std::optional<DaemonFailure> failure;
  std::optional<Value> answer =
      daemon.await(requests::kWatchOpenMessages.name, *filter, waitReadable, failure);
  for (std::int64_t left = options.count; answer && left > 0 && tool.out;) {
    answer = daemon.await(requests::kWatchNextMessages.name, {}, waitReadable, failure);
    if (answer && answer->asMap() != nullptr) print(tool, options, *answer->asMap(), left);
  }
  if (failure) tool.status = tool.fail(failure->status, failure->problem);
}

}  // namespace

void addTailCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "tail", "Messages as they arrive, until interrupted");
  command.footer(
      "A pattern (GLOB) may have *, ? and [...].\n"
      "Who reads too slowly misses messages, and is told how many. Only for trusted users.");
  const auto options = std::make_shared<TailOptions>();
  command.add_option("--id", options->reporterIDs, "Only a session's; may be given several times")
      ->type_name("ID")
      ->allow_extra_args(false)
      ->check(problemWithReporterID)
      ->take_all();
  command
      .add_option("--category", options->category, "Only of this category: a name, as Playback, or a number")
      ->type_name("NAME");
  command.add_option("--type", options->type, "Only of this type: a name, as Start, or a number")
      ->type_name("NAME");
  command.add_option("--app", options->application, "Only of such applications")->type_name("GLOB");
  command.add_option("--device", options->device, "Only of sessions that named such devices last")
      ->type_name("GLOB");
  EventFilterOptions::addService(command, options->service, "Only of sessions");
  EventFilterOptions::refuse(command, {"--since", "--until"},
                             "messages are shown as they arrive; `twctl events` has those from before");
  EventFilterOptions::refuse(command, {"--session"},
                             "the daemon knows a session by its reporter's identifier; use --id");
  command.add_option("-n,--count", options->count, "Only so many")->type_name("N")->check(problemWithCount);
  command.callback([&tool, options] { tail(tool, *options); });
}

}  // namespace tonewerk
