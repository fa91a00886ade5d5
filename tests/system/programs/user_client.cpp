// SPDX-License-Identifier: Apache-2.0
//
// A client of another user. It prints "begun" when it has sent the first message, and "ready" when it has
// sent everything. Then it keeps its connections until it is killed, unless its command ends by itself.
//
//   user_client USER SOCKET COMMAND [NUMBER]...

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <functional>
#include <map>
#include <stdexcept>
#include <string>
#include <sys/resource.h>
#include <unistd.h>
#include <vector>

#include "support/users/Attacker.h"
#include "support/users/RoundTripProbe.h"
#include "support/users/UserIdentity.h"

namespace tonewerk {
namespace {

constexpr const char* kUsage =
    "usage: user_client USER SOCKET COMMAND [NUMBER]...\n"
    "\n"
    "  quiet MILLISECONDS       asks every 2 ms; prints the percentiles of the round trips in ms; ends\n"
    "  ask METHOD               a request without arguments; prints \"error CODE\", \"result\" or \"gone\"; "
    "ends\n"
    "  flood CONNECTIONS        small messages without end\n"
    "  often BYTES TIMES COUNT  COUNT messages that name one session TIMES times; 0: without end\n"
    "  broadcast SESSIONS BYTES COUNT   the same for all sessions\n"
    "  large BYTES COUNT        large messages for one session\n"
    "  nested COUNT             messages of small arrays\n"
    "  unknown COUNT SESSIONS   messages that name sessions that do not exist\n"
    "  unfinished CONNECTIONS   frames that never end; prints \"taken BYTES\"\n"
    "  connections MOST         as many connections as possible; prints \"answered COUNT\"\n"
    "  sessions COUNT           started sessions\n";

struct Call {
  std::string socketPath;
  std::vector<std::string> arguments;

  std::size_t number(std::size_t at) const {
    if (at >= arguments.size()) throw std::runtime_error("an argument is missing");
    return std::strtoul(arguments[at].c_str(), nullptr, 10);
  }
};

void say(const char* word) {
  std::puts(word);
  std::fflush(stdout);
}
void say(const char* word, std::size_t number) {
  std::printf("%s %zu\n", word, number);
  std::fflush(stdout);
}

// Says that the first message is under way when it has been sent.
void repeat(std::size_t count, const std::function<void()>& send) {
  for (std::size_t at = 0; count == 0 || at < count; ++at) {
    send();
    if (at == 0) say("begun");
  }
}

[[noreturn]] void stay() {
  say("ready");
  for (;;) ::pause();
}

void beQuiet(const Call& call) {
  constexpr std::int64_t kReporterID = 77;
  ProbePlan plan;
  plan.duration = std::chrono::milliseconds(call.number(0));
  const RoundTripTimes times = probeRoundTrips(call.socketPath, kReporterID, plan);
  std::printf("count %zu\n", times.count());
  for (const auto& [name, share] : {std::pair{"p50", 0.5}, {"p99", 0.99}, {"max", 1.0}}) {
    std::printf("%s %.3f\n", name, times.millisecondsWithin(share));
  }
}

void ask(const Call& call) {
  if (call.arguments.empty()) throw std::runtime_error("an argument is missing");
  const std::optional<Answer> answer = Attacker(call.socketPath).ask(call.arguments.front(), {});
  if (!answer) return say("gone");
  if (!answer->error) return say("result");
  std::printf("error %lld\n", static_cast<long long>(answer->error->code));
}

void attack(const std::string& command, const Call& call) {
  Attacker attacker(call.socketPath);
  if (command == "flood") {
    attacker.openFlood(call.number(0));
    say("begun");
    attacker.flood();
  } else if (command == "often") {
    attacker.openSessions(1);
    repeat(call.number(2), [&] { attacker.sendToOneSessionOften(call.number(0), call.number(1)); });
  } else if (command == "broadcast") {
    attacker.openSessions(call.number(0));
    repeat(call.number(2), [&] { attacker.broadcast(call.number(1)); });
  } else if (command == "large") {
    attacker.openSessions(1);
    repeat(call.number(1), [&] { attacker.sendLarge(call.number(0)); });
    attacker.waitUntilServed();
  } else if (command == "nested") {
    attacker.openSessions(1);
    repeat(call.number(0), [&] { attacker.sendNested(); });
    attacker.waitUntilServed();
  } else if (command == "unknown") {
    attacker.openSessions(1);
    repeat(call.number(0), [&] { attacker.nameUnknown(call.number(1)); });
    attacker.waitUntilServed();
  } else if (command == "unfinished") {
    say("taken", attacker.leaveUnfinished(call.number(0)));
  } else if (command == "connections") {
    say("answered", attacker.connectAsOftenAsPossible(call.number(0)));
  } else if (command == "sessions") {
    attacker.openSessions(call.number(0));
  } else {
    throw std::runtime_error("no such command: " + command);
  }
  stay();
}

// A thousand connections need more than the usual thousand descriptors.
void allowManyConnections() {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  limit.rlim_cur = limit.rlim_max;
  ::setrlimit(RLIMIT_NOFILE, &limit);
}

void run(std::uint32_t user, const std::string& command, const Call& call) {
  allowManyConnections();
  if (user != ::geteuid()) {
    if (const std::error_code error = becomeUser(user)) {
      throw std::runtime_error("cannot become user " + std::to_string(user) + ": " + error.message());
    }
  }
  if (command == "quiet") return beQuiet(call);
  if (command == "ask") return ask(call);
  attack(command, call);
}

}  // namespace
}  // namespace tonewerk

int main(int count, char** arguments) {
  if (count < 4) {
    std::fputs(tonewerk::kUsage, stderr);
    return 2;
  }
  try {
    tonewerk::run(static_cast<std::uint32_t>(std::strtoul(arguments[1], nullptr, 10)), arguments[3],
                  {arguments[2], {arguments + 4, arguments + count}});
  } catch (const std::exception& error) {
    std::fprintf(stderr, "%s\n", error.what());
    return EXIT_FAILURE;
  }
}
