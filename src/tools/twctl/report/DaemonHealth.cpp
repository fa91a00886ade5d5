// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/DaemonHealth.h"

#include <chrono>
#include <optional>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "protocol/Requests.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/Tool.h"

namespace tonewerk {
namespace {

// A page is made without a daemon, too, so nobody waits long for one.
constexpr std::chrono::seconds kAnswerTimeout{3};
// How often it is looked whether somebody still wants the answer.
constexpr std::chrono::milliseconds kPiece{100};

ValueMap noAnswer(const std::string& reason) { return {{"answers", false}, {"reason", reason}}; }

const ValueArray& arrayOf(const ValueMap& map, const SharedString& key) {
  static const ValueArray kNone;
  const Value* found = map.find(key);
  return found == nullptr || found->asArray() == nullptr ? kNone : *found->asArray();
}

// One row for each thing of which a user was refused more.
ValueArray refusals(const ValueMap& listing) {
  std::vector<Value> refused;
  for (const Value& account : arrayOf(listing, kWatchKeyAccounts)) {
    if (account.asMap() == nullptr) continue;
    const Value user = account.asMap()->integer(kWatchKeyUser);
    for (const Value& resource : arrayOf(*account.asMap(), kWatchKeyResources)) {
      if (resource.asMap() == nullptr || resource.asMap()->integer(kWatchKeyRefused) == 0) continue;
      refused.emplace_back(ValueMap{{"user", user},
                                    {"resource", resource.asMap()->text(kWatchKeyName)},
                                    {"times", resource.asMap()->integer(kWatchKeyRefused)}});
    }
  }
  return ValueArray(std::move(refused));
}

// The lines about all these users that the daemon kept out of its log.
std::int64_t linesHeldBack(const ValueMap& listing) {
  std::int64_t lines = 0;
  for (const Value& account : arrayOf(listing, kWatchKeyAccounts)) {
    if (account.asMap() != nullptr) lines += account.asMap()->integer(kWatchKeyLinesHeldBack);
  }
  return lines;
}

ValueArray sinksOf(const ValueMap& listing) {
  std::vector<Value> sinks;
  for (const Value& sink : arrayOf(listing, kWatchKeySinks)) {
    if (sink.asMap() == nullptr) continue;
    sinks.emplace_back(ValueMap{{"sink", sink.asMap()->text(kWatchKeyName)},
                                {"waiting", sink.asMap()->integer(kWatchKeyWaiting)},
                                {"dropped", sink.asMap()->integer(kWatchKeyDropped)},
                                {"hangs", sink.asMap()->number(kWatchKeyHangs)}});
  }
  return ValueArray(std::move(sinks));
}

// None after kAnswerTimeout or a stop, with the reason in `error`.
std::optional<Answer> accountsOf(DaemonConnection& daemon, const std::stop_token& stop,
                                 std::error_code& error) {
  const auto until = std::chrono::steady_clock::now() + kAnswerTimeout;
  std::optional<Answer> answer;
  error = daemon.request(requests::kWatchAccounts.name, {}, [&](const Answer& given) { answer = given; });
  while (!error && !answer) {
    if (stop.stop_requested()) {
      error = std::make_error_code(std::errc::operation_canceled);
    } else {
      error = daemon.processAnswers(kPiece);
      if (error == std::errc::timed_out && std::chrono::steady_clock::now() < until) error.clear();
    }
  }
  return answer;
}

}  // namespace

ValueMap daemonHealth(const Tool& tool, const std::stop_token& stop) {
  DaemonConnection daemon(DaemonConnection::End::kAtOnce);
  std::error_code error = daemon.connect(tool.socketPaths());
  if (error) return noAnswer(error.message());
  (void)daemon.request(requests::kObserve.name, {}, {});  // an older daemon refuses this and works as before
  const std::optional<Answer> answer = accountsOf(daemon, stop, error);
  if (!answer) return noAnswer(error.message());
  if (answer->error) return noAnswer(DaemonCalls::describe(requests::kWatchAccounts.name, *answer->error));
  const ValueMap* listing = answer->result ? answer->result->asMap() : nullptr;
  if (listing == nullptr) return noAnswer("its answer is not a listing");
  // Users who are not trusted are told of their own account only, and of no sink.
  return {{"answers", true},
          {"tellsSinks", listing->contains(kWatchKeySinks)},
          {"refused", refusals(*listing)},
          {"linesHeldBack", linesHeldBack(*listing)},
          {"sinks", sinksOf(*listing)}};
}

}  // namespace tonewerk
