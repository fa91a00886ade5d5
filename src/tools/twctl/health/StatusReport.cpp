// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/StatusReport.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <ostream>
#include <string_view>
#include <utility>

#include "protocol/WatchKeys.h"
#include "tools/twctl/show/AccountTable.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/SinkTable.h"
#include "tools/twctl/show/Table.h"
#include "tools/twctl/show/UserName.h"
#include "tools/twctl/show/WrappedLines.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr double kMinute = 60.0;
constexpr double kHour = 3600.0;
constexpr double kDay = 86'400.0;
constexpr double kMebibyte = 1024.0 * 1024.0;

std::string whole(double number) { return std::to_string(static_cast<std::int64_t>(std::floor(number))); }

std::string counted(std::int64_t count, const std::string& one, const std::string& several) {
  return std::to_string(count) + " " + (count == 1 ? one : several);
}

std::string_view textOfMode(std::string_view mode) {
  if (mode == "system") return "the system's daemon";
  if (mode == "user") return "the user's own daemon";
  return "a daemon with directories of its own";
}

// "in all" of a sink are counted since the daemon's start.
std::string sinkProblem(const ValueMap& sink) {
  const std::string name = printable(sink.text(kWatchKeyName));
  const std::int64_t hangs = sink.integer(kWatchKeyHangs);
  const std::int64_t dropped = sink.integer(kWatchKeyDropped);
  if (hangs > 0) return "the sink " + name + " hangs for " + durationText(static_cast<double>(hangs));
  return dropped > 0 ? "the sink " + name + " has dropped " + std::to_string(dropped) : "";
}

ValueMap storeForPrograms(const StatusReport& report) {
  const StoreFacts& store = report.store;
  ValueMap map{{"path", store.path},
               {"exists", store.exists},
               {"bytes", store.bytes},
               {"maxBytes", static_cast<std::int64_t>(report.storeMegabytes * kMebibyte)}};
  if (!store.problem.empty()) map.set("problem", store.problem);
  if (store.oldestAt) map.set("oldestAt", *store.oldestAt);
  if (store.newestAt) map.set("newestAt", *store.newestAt);
  if (const auto growth = store.bytesPerDay(report.now)) map.set("bytesPerDay", std::llround(*growth));
  return map;
}

ValueMap daemonForPrograms(const DaemonReport& report) {
  ValueMap map{{"answers", report.answers}};
  if (!report.answers) map.set("problem", report.problem);
  map.merge(report.daemon);
  if (!report.daemon.empty()) map.set("mode", daemonMode(report.daemon));
  return map;
}

ValueArray bridgesForPrograms(const std::vector<BridgeProcess>& bridges) {
  std::vector<Value> listed;
  listed.reserve(bridges.size());
  for (const BridgeProcess& bridge : bridges)
    listed.emplace_back(ValueMap{{"processIdentifier", bridge.identifier}, {"user", bridge.user}});
  return ValueArray(std::move(listed));
}

void printDaemon(const StatusReport& report, WrappedLines& lines) {
  const ValueMap& daemon = report.daemon.daemon;
  if (!report.daemon.answers) return lines.add("daemon", report.daemon.problem);
  if (daemon.empty()) return lines.add("daemon", "an older version, which says nothing of itself");
  const double seconds = daemon.number(kWatchKeySeconds);
  lines.add("daemon", "version " + daemon.text(kWatchKeyVersion) + ", process " +
                          daemon.text(kWatchKeyProcessIdentifier) + " of " +
                          userName(static_cast<std::uint64_t>(daemon.integer(kWatchKeyUser))));
  lines.add("", "since " + localSecond(report.now - seconds) + ", for " + durationText(seconds));
  lines.add("mode", std::string(textOfMode(daemonMode(daemon))) +
                        (daemon.boolean(kWatchKeyInternalBuild) ? "; an internal build" : ""));
}

void printStore(const StatusReport& report, WrappedLines& lines) {
  const StoreFacts& store = report.store;
  lines.add("store", store.path);
  if (!store.problem.empty()) return lines.add("", "cannot be read: " + store.problem);
  if (!store.exists) return lines.add("", "does not exist yet");
  std::string text = sizeText(static_cast<double>(store.bytes)) + " of at most " +
                     sizeText(report.storeMegabytes * kMebibyte);
  if (!store.oldestAt) {
    text += "; no reports";
  } else {
    text += "; the oldest report is " + durationText(report.now - *store.oldestAt) + " old";
  }
  if (const auto growth = store.bytesPerDay(report.now)) text += "; grows by " + sizeText(*growth) + " a day";
  lines.add("", text);
}

void printBridges(const StatusReport& report, WrappedLines& lines) {
  if (report.bridges.empty()) return lines.add("bridge", "no tw-pipewire runs that you can see");
  for (const BridgeProcess& bridge : report.bridges) {
    lines.add("bridge",
              "tw-pipewire, process " + std::to_string(bridge.identifier) + " of " + userName(bridge.user));
  }
}

void printAccounts(const StatusReport& report, std::ostream& out, std::optional<std::size_t> width) {
  {
    AccountTable table(out);
    if (width) table.fit(*width);
    for (const ValueMap& account : mapsIn(report.daemon.accounts)) table.add(account);
  }
  const std::int64_t more = report.daemon.users - static_cast<std::int64_t>(report.daemon.accounts.size());
  if (more > 0) out << "and " << counted(more, "more user", "more users") << '\n';
}

void printSinks(const ValueArray& sinks, std::ostream& out, std::optional<std::size_t> width) {
  SinkTable table(out);
  if (width) table.fit(*width);
  for (const ValueMap& sink : mapsIn(sinks)) table.add(sink);
}

void printEndpoints(const ValueArray& endpoints, std::ostream& out, std::optional<std::size_t> width) {
  Table table(out, false, {"endpoint", "waiting", "dropped", "problem"});
  if (width) table.fit(*width);
  for (const ValueMap& endpoint : mapsIn(endpoints)) {
    const std::string problem = endpoint.text(kWatchKeyProblem);
    table.add({Value(endpoint.text(kWatchKeyName)), Value(endpoint.integer(kWatchKeyWaiting)),
               Value(endpoint.integer(kWatchKeyDropped)), Value(problem.empty() ? "none" : problem)});
  }
}

void printTroubles(const ValueArray& troubles, WrappedLines& lines, std::ostream& out) {
  out << "\nlast errors in the daemon's log\n";
  for (const ValueMap& trouble : mapsIn(troubles)) {
    std::string text = trouble.text(kWatchKeyText);
    const std::int64_t times = trouble.integer(kWatchKeyTimes);
    if (times > 1) text += " (" + std::to_string(times) + " times)";
    if (trouble.contains(kWatchKeyUser))
      text += " (by " + userName(static_cast<std::uint64_t>(trouble.integer(kWatchKeyUser))) + ")";
    lines.add(localSecond(trouble.number(kWatchKeyTime)), text);
  }
}

}  // namespace

std::vector<std::string> StatusReport::problems() const {
  std::vector<std::string> found;
  if (!daemon.answers) found.push_back(daemon.problem);
  const std::string version = daemon.daemon.text(kWatchKeyVersion);
  if (!version.empty() && version != ownVersion)
    found.push_back("the daemon has the version " + version + ", this program " + ownVersion);
  if (!store.problem.empty() && !store.isForbidden)
    found.push_back("the store cannot be read: " + store.problem);
  for (const ValueMap& sink : mapsIn(daemon.sinks.value_or(ValueArray()))) {
    if (std::string problem = sinkProblem(sink); !problem.empty()) found.push_back(std::move(problem));
  }
  for (const ValueMap& endpoint : mapsIn(daemon.endpoints.value_or(ValueArray()))) {
    const std::string problem = endpoint.text(kWatchKeyProblem);
    if (!problem.empty())
      found.push_back("sending to " + endpoint.text(kWatchKeyName) + " fails: " + problem);
  }
  std::int64_t errors = 0;
  for (const ValueMap& trouble : mapsIn(daemon.troubles.value_or(ValueArray())))
    errors += isRecentTrouble(trouble, now) ? trouble.integer(kWatchKeyTimes) : 0;
  if (errors > 0)
    found.push_back("the daemon has logged " + counted(errors, "error", "errors") + " in the last hour");
  return found;
}

ValueMap StatusReport::forPrograms() const {
  std::vector<Value> wrong;
  for (const std::string& problem : problems()) wrong.emplace_back(problem);
  const bool isWell = wrong.empty();
  ValueMap map{{"well", isWell},
               {"problems", ValueArray(std::move(wrong))},
               {"daemon", daemonForPrograms(daemon)},
               {"store", storeForPrograms(*this)},
               {"bridges", bridgesForPrograms(bridges)}};
  if (!daemon.answers) return map;
  map.set("users", daemon.users);
  map.set("accounts", daemon.accounts);
  // What only trusted users may see is absent for others, and not empty.
  if (daemon.sinks) map.set("sinks", *daemon.sinks);
  if (daemon.endpoints) map.set("endpoints", *daemon.endpoints);
  if (daemon.troubles) map.set("troubles", *daemon.troubles);
  return map;
}

void StatusReport::print(std::ostream& out, std::optional<std::size_t> width) const {
  WrappedLines lines(out, 8, width);
  printDaemon(*this, lines);
  printStore(*this, lines);
  printBridges(*this, lines);
  if (daemon.answers) {
    out << '\n';
    printAccounts(*this, out, width);
  }
  if (daemon.sinks && !daemon.sinks->empty()) {
    out << '\n';
    printSinks(*daemon.sinks, out, width);
  }
  if (daemon.endpoints && !daemon.endpoints->empty()) {
    out << '\n';
    printEndpoints(*daemon.endpoints, out, width);
  }
  if (daemon.troubles && !daemon.troubles->empty()) {
    WrappedLines troubles(out, 20, width);
    printTroubles(*daemon.troubles, troubles, out);
  }
  out << '\n';
  const std::vector<std::string> wrong = problems();
  // The first line has said that no daemon answers.
  if (daemon.answers) {
    for (const std::string& problem : wrong) lines.add("wrong", problem);
  }
  if (wrong.empty()) {
    lines.add("well", "nothing is wrong");
  } else {
    lines.add("", "'twctl doctor' says what to do");
  }
}

bool isRecentTrouble(const ValueMap& trouble, double now) {
  return !trouble.contains(kWatchKeyUser) &&
         trouble.number(kWatchKeyTime) >= now - StatusReport::kRecentSeconds;
}

std::string sizeText(double bytes) {
  constexpr std::array<std::string_view, 4> kUnits{"B", "KiB", "MiB", "GiB"};
  std::size_t unit = 0;
  while (bytes >= 1024 && unit + 1 < kUnits.size()) {
    bytes /= 1024;
    ++unit;
  }
  std::array<char, 48> text{};
  std::snprintf(text.data(), text.size(), unit == 0 ? "%.0f " : "%.1f ", bytes);
  return text.data() + std::string(kUnits[unit]);
}

std::string durationText(double seconds) {
  if (seconds < kMinute) return whole(std::max(seconds, 0.0)) + " s";
  if (seconds < kHour) return whole(seconds / kMinute) + " min";
  if (seconds < kDay)
    return whole(seconds / kHour) + " h " + whole(std::fmod(seconds, kHour) / kMinute) + " min";
  return whole(seconds / kDay) + " d " + whole(std::fmod(seconds, kDay) / kHour) + " h";
}

}  // namespace tonewerk
