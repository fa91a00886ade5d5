// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/DaemonReport.h"

#include <chrono>
#include <cstdlib>
#include <system_error>

#include "protocol/Requests.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/DaemonConnection.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kAnswerTimeout{10};

std::optional<ValueArray> arrayUnder(const SharedString& key, const ValueMap& map) {
  const Value* found = map.find(key);
  return found == nullptr || found->asArray() == nullptr ? std::nullopt : std::optional(*found->asArray());
}

}  // namespace

Directories DaemonReport::directoriesOr(const Directories& own) const {
  Directories directories = own;
  const auto take = [&](const SharedString& key, std::string& directory) {
    if (const std::string path = daemon.text(key); !path.empty()) directory = path;
  };
  take(kWatchKeyRuntime, directories.runtime);
  take(kWatchKeyState, directories.state);
  take(kWatchKeyConfiguration, directories.configuration);
  return directories;
}

DaemonReport reportOf(const ValueMap& listing) {
  DaemonReport report;
  report.answers = true;
  report.isConnected = true;
  const Value* daemon = listing.find(kWatchKeyDaemon);
  if (daemon != nullptr && daemon->asMap() != nullptr) report.daemon = *daemon->asMap();
  report.accounts = arrayUnder(kWatchKeyAccounts, listing).value_or(ValueArray());
  report.users = listing.integer(kWatchKeyTotal);
  report.sinks = arrayUnder(kWatchKeySinks, listing);
  report.endpoints = arrayUnder(kWatchKeyEndpoints, listing);
  report.troubles = arrayUnder(kWatchKeyTroubles, listing);
  return report;
}

DaemonReport askDaemon(const Tool& tool) {
  DaemonReport report;
  DaemonConnection connection;
  const std::vector<std::string> paths = tool.socketPaths();
  if (const std::error_code error = connection.connect(paths)) {
    report.problem = "no daemon listens on ";
    for (std::size_t at = 0; at < paths.size(); ++at) report.problem += (at == 0 ? "" : ", ") + paths[at];
    report.problem += " (" + error.message() + ")";
    return report;
  }
  report.isConnected = true;
  (void)connection.request(requests::kObserve.name, {}, {});
  std::error_code error;
  const std::optional<Answer> answer =
      connection.call(requests::kWatchAccounts.name, {}, kAnswerTimeout, error);
  const ValueMap* listing = answer && answer->result ? answer->result->asMap() : nullptr;
  if (!answer) {
    report.isSilent = true;
    report.problem = "the daemon does not answer (" + error.message() + ")";
  } else if (answer->error) {
    report.problem = DaemonCalls::describe(requests::kWatchAccounts.name, *answer->error);
  } else if (listing == nullptr) {
    report.problem = "the daemon's answer is no listing";
  }
  if (listing == nullptr) return report;
  report = reportOf(*listing);
  if (!report.sinks) return report;
  const std::optional<Answer> sessions =
      connection.call(requests::kWatchSessions.name, {Value(0)}, kAnswerTimeout, error);
  if (sessions && sessions->result && sessions->result->asMap() != nullptr)
    report.sessions = arrayUnder(kWatchKeySessions, *sessions->result->asMap());
  return report;
}

std::string daemonMode(const ValueMap& daemon) {
  const std::string state = daemon.text(kWatchKeyState);
  if (state == Directories::system().state) return "system";
  // Without the variables that a service manager sets, as in another session of the user.
  const auto variable = [](const std::string& name) -> std::optional<std::string> {
    const char* value = name.ends_with("_DIRECTORY") ? nullptr : std::getenv(name.c_str());
    return value == nullptr ? std::nullopt : std::optional<std::string>(value);
  };
  const Directories own = Directories::from(variable, static_cast<uid_t>(daemon.integer(kWatchKeyUser)));
  return state == own.state ? "user" : "private";
}

std::vector<ValueMap> mapsIn(const ValueArray& array) {
  std::vector<ValueMap> maps;
  for (const Value& entry : array) {
    if (entry.asMap() != nullptr) maps.push_back(*entry.asMap());
  }
  return maps;
}

}  // namespace tonewerk
