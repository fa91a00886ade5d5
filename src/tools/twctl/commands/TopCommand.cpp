// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <memory>
#include <optional>
#include <ostream>
#include <thread>
#include <utility>

#include "protocol/Requests.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/LiveEvents.h"
#include "tools/twctl/commands/TopLoop.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/SessionRates.h"
#include "tools/twctl/show/TopFrame.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr char kControlC = 3;

double steadyNow() {
  return std::chrono::duration<double>(std::chrono::steady_clock::now().time_since_epoch()).count();
}

// Shows pages on the tool's terminal.
class TerminalScreen final : public LiveScreen {
 public:
  explicit TerminalScreen(const Tool& tool)
      : out_(tool.out),
        events_(tool.inDescriptor, tool.outDescriptor),
        terminal_(tool.out, tool.inDescriptor, tool.outDescriptor) {}

  TerminalSize size() const override { return terminal_.size(); }
  void show(const std::vector<std::string>& lines) override { terminal_.show(lines); }
  double now() const override { return steadyNow(); }

  [[nodiscard]] Event waitUntil(double time) override {
    const auto until = LiveEvents::Time(
        std::chrono::duration_cast<LiveEvents::Time::duration>(std::chrono::duration<double>(time)));
    for (;;) {
      const LiveEvents::Event event = events_.wait(-1, until);
      if (event == LiveEvents::Event::kTime) return Event::kTime;
      if (event == LiveEvents::Event::kResized) return Event::kResized;
      if (isEnd(event)) return Event::kQuit;
    }
  }

  // False when the user quits before the descriptor is readable.
  bool waitReadable(int descriptor) {
    for (;;) {
      const LiveEvents::Event event = events_.wait(descriptor, std::nullopt);
      if (event == LiveEvents::Event::kReadable) return true;
      if (isEnd(event)) return false;
    }
  }

 private:
  bool isEnd(LiveEvents::Event event) const {
    if (event == LiveEvents::Event::kStopped || !out_) return true;
    if (event != LiveEvents::Event::kKey) return false;
    return events_.key() == 'q' || events_.key() == 'Q' || events_.key() == kControlC;
  }

  std::ostream& out_;
  LiveEvents events_;
  Terminal terminal_;  // destroyed, and so restored, before the signal handlers are
};

// Reads all sessions in portions. None when `ask` returned none.
template <typename Ask>
std::optional<std::vector<ValueMap>> listSessions(Ask ask) {
  std::vector<ValueMap> sessions;
  for (std::size_t total = 1; sessions.size() < total;) {
    const std::optional<Value> answer = ask(Arguments{Value(sessions.size())});
    if (!answer) return std::nullopt;
    const ValueMap* portion = answer->asMap();
    const Value* list = portion == nullptr ? nullptr : portion->find(kWatchKeySessions);
    if (list == nullptr || list->asArray() == nullptr || list->asArray()->empty()) break;
    for (const Value& session : *list->asArray()) {
      if (session.asMap() != nullptr) sessions.push_back(*session.asMap());
    }
    total = static_cast<std::size_t>(std::max<std::int64_t>(portion->integer(kWatchKeyTotal), 0));
  }
  return sessions;
}

void printFrame(const Tool& tool, const std::vector<SessionRow>& rows) {
  if (tool.asJson) {
    for (const SessionRow& row : rows) tool.out << printable(topObject(row).text()) << '\n';
  } else {
    for (const std::string& line : topFrame(rows, std::nullopt)) tool.out << line << '\n';
  }
  tool.out.flush();
}

// Reads two listings, because a rate needs two.
void printOneFrame(const Tool& tool, DaemonCalls& daemon, double interval) {
  const auto ask = [&daemon](const Arguments& arguments) -> std::optional<Value> {
    std::optional<Value> result;
    return daemon.call(requests::kWatchSessions.name, arguments, result) ? result : std::nullopt;
  };
  SessionRates rates;
  const auto first = listSessions(ask);
  if (!first) return;
  rates.rowsOf(*first, steadyNow());  // only to have counts to compare with
  std::this_thread::sleep_for(std::chrono::duration<double>(interval));
  const auto second = listSessions(ask);
  if (second) printFrame(tool, rates.rowsOf(*second, steadyNow()));
}

void showOnTerminal(Tool& tool, DaemonCalls& daemon, double interval) {
  std::optional<DaemonFailure> failure;
  {
    TerminalScreen screen(tool);
    const auto ask = [&](const Arguments& arguments) {
      return daemon.await(
          requests::kWatchSessions.name, arguments,
          [&screen](int descriptor) { return screen.waitReadable(descriptor); }, failure);
    };
    runTop([&ask] { return listSessions(ask); }, screen, interval);
  }
  if (failure) tool.status = tool.fail(failure->status, failure->problem);
}

void top(Tool& tool, double interval) {
  DaemonCalls daemon(tool);
  if (!daemon.connect(DaemonCalls::Role::kOnlooker)) return;
  if (tool.outIsTerminal && !tool.asJson) {
    showOnTerminal(tool, daemon, interval);
  } else {
    printOneFrame(tool, daemon, interval);
  }
}

}  // namespace

void addTopCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "top", "What sessions receive, as it happens, the busiest first");
  command.footer(
      "On a terminal until q or Ctrl-C; elsewhere, and with --json, once, after one interval. Only for "
      "trusted\n"
      "users.");
  const auto interval = std::make_shared<double>(1.0);
  command.add_option("--interval", *interval, "Over so many seconds messages are counted (1)")
      ->check(problemWithSeconds)
      ->type_name("SECONDS");
  command.callback([&tool, interval] { top(tool, *interval); });
}

}  // namespace tonewerk
