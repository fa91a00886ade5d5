// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/JsonService.h"
#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/SessionLookup.h"
#include "tools/twctl/input/ValueArguments.h"

namespace tonewerk {
namespace {

struct SendOptions {
  std::vector<ReporterID> reporterIDs;
  std::string category;
  std::string type;
  std::vector<std::string> entries;
  std::optional<std::string> payload;
};

std::optional<ValueMap> payloadOf(const Tool& tool, const SendOptions& options, std::string& problem) {
  if (options.payload) {
    std::optional<Value> value = tool.json.parse(*options.payload, problem);
    if (!value) {
      problem = "--payload: " + problem;
      return std::nullopt;
    }
    if (const ValueMap* map = value->asMap()) return *map;
    problem = "--payload must be a JSON object";
    return std::nullopt;
  }
  ValueMap map;
  for (const std::string& text : options.entries) {
    const std::optional<ValueMapEntry> entry = entryOfArgument(text);
    if (!entry) {
      problem = "\"" + text + "\" is not KEY=VALUE";
      return std::nullopt;
    }
    map.set(entry->key, entry->value);
  }
  return map;
}

// False when an identifier names no session; the problem is then printed. The daemon itself ignores such
// identifiers.
bool knowsAll(Tool& tool, DaemonCalls& daemon, const std::vector<ReporterID>& reporterIDs) {
  std::string unknown;
  for (const ReporterID reporterID : reporterIDs) {
    std::optional<AudioServiceType> serviceType;
    if (!lookUpSession(daemon, reporterID, serviceType)) return false;
    if (reporterID == 0 || !serviceType)
      unknown += (unknown.empty() ? "" : ", ") + std::to_string(reporterID);
  }
  if (unknown.empty()) return true;
  const char* which = unknown.find(',') == std::string::npos ? "the identifier " : "any of the identifiers ";
  tool.status = tool.fail(kRefused, "no session has " + (which + unknown) + "; the message was sent to none");
  return false;
}

void send(Tool& tool, const SendOptions& options) {
  const auto refuseUsage = [&tool](const std::string& problem) {
    tool.status = tool.fail(kWrongUsage, problem);
  };
  const auto category = categoryOfArgument(options.category);
  if (!category) return refuseUsage(unknownCategory(options.category));
  const auto type = typeOfArgument(options.type);
  if (!type) return refuseUsage(unknownType(options.type));
  std::string problem;
  std::optional<ValueMap> payload = payloadOf(tool, options, problem);
  if (!payload) return refuseUsage(problem);

  DaemonCalls daemon(tool);
  std::optional<Value> result;
  if (!daemon.connect(DaemonCalls::Role::kClient) || !knowsAll(tool, daemon, options.reporterIDs)) return;
  Argument recipients;
  if (!options.reporterIDs.empty())
    recipients = ValueArray(std::vector<Value>(options.reporterIDs.begin(), options.reporterIDs.end()));
  // A failure is already printed and in the tool's status.
  (void)daemon.call(requests::kSendMessage.name,
                    {Value(std::move(*payload)), Value(*category), Value(*type), recipients}, result);
}

}  // namespace

void addSendCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "send", "Sends a message to sessions");
  const auto options = std::make_shared<SendOptions>();
  command
      .add_option("--id", options->reporterIDs, "A session's identifier; without any, every started session")
      ->type_name("ID")
      ->allow_extra_args(false)
      ->check(problemWithReporterID)
      ->take_all();
  command.add_option("--category", options->category, "Its name, as Playback or HAL_Playback, or number")
      ->type_name("NAME")
      ->required();
  command.add_option("--type", options->type, "Its name, as Start, or number")->type_name("NAME")->required();
  CLI::Option* entries =
      command.add_option("KEY=VALUE", options->entries,
                         "What the message says; a value is true, false, a number, or else a text");
  CLI::Option* payload = command.add_option("--payload", options->payload, "The same as one JSON object");
  payload->excludes(entries);
  command.callback([&tool, options, entries, payload] {
    if (entries->count() + payload->count() == 0) throw CLI::RequiredError("KEY=VALUE or --payload");
    send(tool, *options);
  });
}

}  // namespace tonewerk
