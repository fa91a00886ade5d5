// SPDX-License-Identifier: Apache-2.0
//
// The checks of the clock, the store, and of what was lost on the way to it.
#include <algorithm>
#include <array>
#include <cmath>
#include <string_view>

#include "platform/PreferenceSchema.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/health/Checkup.h"
#include "tools/twctl/health/ShellWord.h"
#include "tools/twctl/health/StatusReport.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/UserName.h"

namespace tonewerk {
namespace {

constexpr double kDay = 86'400.0;
// No release is older, so a clock that shows an earlier time was never set: the beginning of 2026.
constexpr double kEarliest = 1'767'225'600.0;
constexpr double kMaxJumpSeconds = 60.0;
constexpr double kMaxFutureSeconds = 300.0;
constexpr double kMebibyte = 1024.0 * 1024.0;
constexpr const char* kSetClock = "sudo timedatectl set-ntp true";

// What a user may hold of is bounded by these preferences.
struct Bounded {
  std::string_view resource;
  std::string_view preference;
};
constexpr std::array<Bounded, 3> kBounded{{{"unfinishedBytes", "unfinished_megabytes"},
                                           {"keptBytes", "kept_megabytes"},
                                           {"snapshotBytes", "snapshot_megabytes"}}};

void checkAccount(const Checkup& checkup, const ValueMap& account, Findings& findings) {
  const Value* resources = account.find(kWatchKeyResources);
  if (resources == nullptr || resources->asArray() == nullptr) return;
  for (const ValueMap& resource : mapsIn(*resources->asArray())) {
    const std::string name = resource.text(kWatchKeyName);
    const auto bounded =
        std::find_if(kBounded.begin(), kBounded.end(), [&](const Bounded& b) { return b.resource == name; });
    const std::int64_t refused = resource.integer(kWatchKeyRefused);
    if (refused == 0 || bounded == kBounded.end()) continue;
    const std::string_view domain = "com.orvane.tonewerk.service";
    const double twice = 2 * findPreference(domain, bounded->preference)->fallback->number();
    findings.add("refused-user",
                 userName(static_cast<std::uint64_t>(account.integer(kWatchKeyUser))) +
                     " was refused more of " + name + " " + std::to_string(refused) + " times",
                 checkup.twctl() + " defaults write " + std::string(domain) + " " +
                     std::string(bounded->preference) + " " + std::to_string(static_cast<int>(twice)) + "; " +
                     checkup.systemctl() + " reload twreportingd.service");
  }
}

void checkSinks(const Checkup& checkup, Findings& findings) {
  const std::string look = "df -h " + shellWord(checkup.directories.state);
  for (const ValueMap& sink : mapsIn(checkup.daemon.sinks.value_or(ValueArray()))) {
    const std::string name = sink.text(kWatchKeyName);
    const std::int64_t hangs = sink.integer(kWatchKeyHangs);
    const std::int64_t dropped = sink.integer(kWatchKeyDropped);
    const std::string remedy = name == "endpoints" || name == "linkReport" ? "twctl status" : look;
    if (hangs > 0)
      findings.add("hanging-sink",
                   name + " has made no progress for " + durationText(static_cast<double>(hangs)), remedy);
    if (dropped > 0)
      findings.add("dropping-sink",
                   name + " has dropped " + std::to_string(dropped) + " since the daemon's start", remedy);
  }
}

void checkErrors(const Checkup& checkup, Findings& findings) {
  std::int64_t errors = 0;
  std::string newest;
  for (const ValueMap& line : mapsIn(checkup.daemon.troubles.value_or(ValueArray()))) {
    if (!isRecentTrouble(line, checkup.around.now)) continue;
    errors += line.integer(kWatchKeyTimes);
    if (newest.empty()) newest = localSecond(line.number(kWatchKeyTime)) + " " + line.text(kWatchKeyText);
  }
  if (errors == 0) return;
  findings.add("logged-errors",
               std::to_string(errors) + (errors == 1 ? " error" : " errors") + ", the newest: " + newest,
               std::string(checkup.isSystemWide ? "sudo journalctl" : "journalctl --user") +
                   " -u twreportingd -p err --since -1h");
}

}  // namespace

void checkClock(const Checkup& checkup, Findings& findings) {
  const double now = checkup.around.now;
  if (now < kEarliest) findings.add("unset-clock", "the clock shows " + localSecond(now));
  const ValueMap& daemon = checkup.daemon.daemon;
  if (daemon.contains(kWatchKeyStartedAt)) {
    const double jump = now - daemon.number(kWatchKeyStartedAt) - daemon.number(kWatchKeySeconds);
    if (std::abs(jump) > kMaxJumpSeconds)
      findings.add("jumped-clock",
                   "the clock has jumped " + std::string(jump > 0 ? "ahead" : "back") + " by " +
                       durationText(std::abs(jump)) + " since the daemon's start",
                   kSetClock);
  }
  if (checkup.store.newestAt && *checkup.store.newestAt > now + kMaxFutureSeconds)
    findings.add("future-reports", "the newest report is of " + localSecond(*checkup.store.newestAt) +
                                       ", and the clock shows " + localSecond(now));
}

void checkStore(const Checkup& checkup, Findings& findings) {
  const StoreFacts& store = checkup.store;
  if (store.isForbidden) {
    findings.couldNotSee(store.path + ": " + store.problem);
  } else if (!store.problem.empty()) {
    findings.add("unreadable-store", store.path + ": " + store.problem, checkup.restart());
  }
  if (store.newerSchema)
    findings.add("newer-store", "a daemon with schema " + std::to_string(*store.newerSchema) +
                                    " has made the store; this one uses " + store.path);
  if (store.hasDamagedCopy)
    findings.add("damaged-store", store.path + ".corrupt is a store that was damaged",
                 "rm " + shellWord(store.path + ".corrupt"));
  const std::optional<Surroundings::Space> space = checkup.around.space(checkup.directories.state);
  if (!space) return;
  const double wanted = std::max(0.0, checkup.storeMegabytes * kMebibyte - static_cast<double>(store.bytes));
  const auto free = static_cast<double>(space->freeBytes);
  if (free >= wanted) return;
  const double room = std::max(1.0, std::floor((free / 2 + static_cast<double>(store.bytes)) / kMebibyte));
  findings.add("full-disk",
               checkup.directories.state + " has " + sizeText(free) + " left, and the store may still take " +
                   sizeText(wanted),
               checkup.twctl() + " defaults write com.orvane.tonewerk.store max_megabytes " +
                   std::to_string(static_cast<std::int64_t>(room)));
}

void checkReports(const Checkup& checkup, Findings& findings) {
  const DaemonReport& daemon = checkup.daemon;
  if (daemon.answers && !daemon.sinks)
    findings.couldNotSee(
        "sinks, endpoints, errors and sessions: the daemon tells them to trusted users only");
  checkSinks(checkup, findings);
  for (const ValueMap& account : mapsIn(daemon.accounts)) checkAccount(checkup, account, findings);
  const std::int64_t lost = messagesDroppedByPrograms(checkup.store, checkup.around.now - kDay).value_or(0);
  if (lost > 0)
    findings.add("lost-messages",
                 "programs have dropped " + std::to_string(lost) + " messages in the last day");
  const std::vector<ValueMap> sessions = mapsIn(daemon.sessions.value_or(ValueArray()));
  const bool isIdle = std::none_of(sessions.begin(), sessions.end(), [](const ValueMap& session) {
    return session.boolean(kWatchKeyStarted) || session.boolean(kWatchKeySingleMessageSession);
  });
  if (!sessions.empty() && isIdle)
    findings.add("idle-sessions", "none of " + std::to_string(sessions.size()) + " sessions is started");
  checkErrors(checkup, findings);
}

}  // namespace tonewerk
