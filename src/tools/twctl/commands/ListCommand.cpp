// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <fnmatch.h>
#include <memory>
#include <optional>
#include <string>

#include "protocol/EventTexts.h"
#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/SessionLookup.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/SessionTable.h"

namespace tonewerk {
namespace {

bool isOf(const std::optional<std::string>& service, AudioServiceType type) {
  return !service || fnmatch(service->c_str(),
                             TWReportingUtilityGenerateServiceNameFromServiceType(type).c_str(), 0) == 0;
}

void list(Tool& tool, const std::optional<std::string>& service) {
  const PagedOutput pages(tool);
  DaemonCalls daemon(tool);
  std::optional<Value> reporters;
  if (!daemon.connect(DaemonCalls::Role::kOnlooker) ||
      !daemon.call(requests::kGetAllReporters.name, {}, reporters))
    return;
  SessionTable table(tool);
  const ValueArray* identifiers = reporters ? reporters->asArray() : nullptr;
  if (identifiers == nullptr) return;
  for (const Value& identifier : *identifiers) {
    std::optional<AudioServiceType> serviceType;
    if (!lookUpSession(daemon, identifier.integer(), serviceType)) return;
    // A session that has ended since then is left out.
    if (serviceType && isOf(service, *serviceType)) table.add(identifier.integer(), *serviceType);
  }
}

}  // namespace

void addListCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "list", "The sessions that the caller may reach");
  const auto service = std::make_shared<std::optional<std::string>>();
  EventFilterOptions::addService(command, *service, "Only those");
  command.callback([&tool, service] { list(tool, *service); });
}

}  // namespace tonewerk
