// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <deque>
#include <memory>
#include <optional>
#include <ostream>
#include <thread>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/channels/LinuxChanmeter.h"
#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/LiveEvents.h"
#include "tools/twctl/commands/TopLoop.h"
#include "tools/twctl/commands/WatchedSessions.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/AudioHealth.h"
#include "tools/twctl/show/SessionRates.h"
#include "tools/twctl/show/TopFrame.h"
#include "tools/twctl/terminal/CursesScreen.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

double steadyNow() {
  return std::chrono::duration<double>(std::chrono::steady_clock::now().time_since_epoch()).count();
}

// Shows pages on the tool's terminal. Keys that are pressed while the daemon is asked wait for waitUntil().
class TerminalScreen final : public LiveScreen {
 public:
  // isOpen() says whether pages can be shown.
  explicit TerminalScreen(const Tool& tool)
      : events_(tool.inDescriptor, tool.outDescriptor, LiveEvents::Keys::kLeft),
        screen_(CursesScreen::open(tool.inDescriptor, tool.outDescriptor)) {}

  bool isOpen() const { return screen_ != nullptr; }

  TerminalSize size() const override { return screen_->size(); }
  void show(const std::vector<TopLine>& lines) override { screen_->show(lines); }
  double now() const override { return steadyNow(); }
  char32_t key() const override { return key_; }

  [[nodiscard]] Event waitUntil(double time) override {
    const auto until = LiveEvents::Time(
        std::chrono::duration_cast<LiveEvents::Time::duration>(std::chrono::duration<double>(time)));
    for (;;) {
      if (!pressed_.empty()) {
        key_ = pressed_.front();
        pressed_.pop_front();
        return Event::kKey;
      }
      switch (events_.wait(-1, until)) {
        case LiveEvents::Event::kTime:
          return Event::kTime;
        case LiveEvents::Event::kStopped:
          return Event::kQuit;
        case LiveEvents::Event::kResized:
          screen_->resize();
          return Event::kResized;
        case LiveEvents::Event::kKey:
          takeKeys();
          break;
        case LiveEvents::Event::kReadable:
          break;
      }
    }
  }

  // False when the user quits before the descriptor is readable.
  bool waitReadable(int descriptor) {
    for (;;) {
      switch (events_.wait(descriptor, std::nullopt)) {
        case LiveEvents::Event::kReadable:
          return true;
        case LiveEvents::Event::kStopped:
          return false;
        case LiveEvents::Event::kResized:
          screen_->resize();
          break;
        case LiveEvents::Event::kKey:
          takeKeys();
          if (std::any_of(pressed_.begin(), pressed_.end(), endsAtOnce)) return false;
          break;
        case LiveEvents::Event::kTime:
          break;
      }
    }
  }

 private:
  static constexpr std::size_t kMostKeys = 1000;

  // While the daemon does not answer, nothing else can be done.
  static bool endsAtOnce(char32_t key) { return key == U'q' || key == U'Q' || key == kKeyControlC; }

  void takeKeys() {
    while (const auto key = screen_->takeKey()) {
      if (pressed_.size() < kMostKeys) pressed_.push_back(*key);
    }
  }

  LiveEvents events_;
  std::unique_ptr<CursesScreen> screen_;  // destroyed, and so restored, before the signal handlers are
  std::deque<char32_t> pressed_;
  char32_t key_ = 0;
};

// Reads the driver channels of the chosen directories.
class Channels {
 public:
  explicit Channels(const Tool& tool)
      : category_(log_, "com.orvane.tonewerk", "twctl"),
        chanmeter_(tool.directories().runtime + "/channels", category_) {}

  AudioHealth health() { return reader_.read(); }

 private:
  // Whoever asks about sessions is not told of a driver's wrong file; `twctl channels` does that.
  class NoLog final : public Log {
    bool isEnabled(std::string_view /*category*/, LogLevel /*level*/) const override { return false; }
    void write(std::string_view /*subsystem*/, std::string_view /*category*/, LogLevel /*level*/,
               std::string_view /*message*/) override {}
  };

  NoLog log_;
  LogCategory category_;
  LinuxChanmeter chanmeter_;
  AudioHealthReader reader_{chanmeter_};
};

void printFrame(const Tool& tool, const std::vector<SessionRow>& rows, const AudioHealth& health) {
  if (tool.asJson) {
    for (const SessionRow& row : rows) tool.out << printable(topObject(row).text()) << '\n';
  } else {
    for (const std::string& line : topFrame(rows, health)) tool.out << line << '\n';
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
  Channels channels(tool);
  const auto first = readWatchedSessions(ask);
  if (!first) return;
  rates.rowsOf(*first, steadyNow());  // only to have counts to compare with
  channels.health();
  std::this_thread::sleep_for(std::chrono::duration<double>(interval));
  const auto second = readWatchedSessions(ask);
  if (second) printFrame(tool, rates.rowsOf(*second, steadyNow()), channels.health());
}

// False when the terminal cannot show pages; nothing is then done.
bool showOnTerminal(Tool& tool, DaemonCalls& daemon, double interval) {
  std::optional<DaemonFailure> failure;
  {
    TerminalScreen screen(tool);
    if (!screen.isOpen()) return false;
    const auto ask = [&](const Arguments& arguments) {
      return daemon.await(
          requests::kWatchSessions.name, arguments,
          [&screen](int descriptor) { return screen.waitReadable(descriptor); }, failure);
    };
    Channels channels(tool);
    runTop([&ask] { return readWatchedSessions(ask); }, [&channels] { return channels.health(); }, screen,
           interval);
  }
  if (failure) tool.status = tool.fail(failure->status, failure->problem);
  return true;
}

void top(Tool& tool, double interval) {
  DaemonCalls daemon(tool);
  if (!daemon.connect(DaemonCalls::Role::kOnlooker)) return;
  const bool wantsPages = tool.outIsTerminal && !tool.asJson;
  if (!wantsPages || !showOnTerminal(tool, daemon, interval)) printOneFrame(tool, daemon, interval);
}

}  // namespace

void addTopCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "top", "What sessions receive, and how the audio does, as it happens");
  command.footer(
      "On a terminal until q or Ctrl-C; h shows the keys: sorting, filter, columns, the graph's nodes, "
      "pause.\n"
      "Elsewhere, and with --json, once, after one interval. Only for trusted users.");
  const auto interval = std::make_shared<double>(1.0);
  command.add_option("--interval", *interval, "Over so many seconds messages are counted (1)")
      ->check(problemWithSeconds)
      ->type_name("SECONDS");
  command.callback([&tool, interval] { top(tool, *interval); });
}

}  // namespace tonewerk
