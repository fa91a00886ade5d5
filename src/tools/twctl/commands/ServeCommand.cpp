// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <ostream>
#include <stop_token>
#include <string>
#include <sys/stat.h>
#include <utility>
#include <vector>

#include "platform/linux/store/StoreFile.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/LiveEvents.h"
#include "tools/twctl/commands/ReportReading.h"
#include "tools/twctl/serve/DaemonWatch.h"
#include "tools/twctl/serve/HttpServer.h"
#include "tools/twctl/serve/LiveFeed.h"
#include "tools/twctl/serve/PageServer.h"
#include "tools/twctl/serve/RequestCheck.h"
#include "tools/twctl/serve/ServeToken.h"
#include "tools/twctl/serve/StateSender.h"
#include "tools/twctl/serve/StoredReport.h"

namespace tonewerk {
namespace {

using std::chrono::steady_clock;

// How often the store is looked at.
constexpr std::chrono::milliseconds kTick{500};

struct ServeOptions {
  std::uint16_t port = 0;
  ReportScopeOptions scope;
};

double secondsSince1970() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// The times and sizes of the store's files, which every write changes.
std::string stampOf(const std::string& directory) {
  const std::string path = storeFileIn(directory).path;
  std::string stamp;
  for (const char* suffix : {"", "-wal"}) {
    struct stat found {};
    if (::stat((path + suffix).c_str(), &found) != 0) found = {};
    for (const auto number :
         {static_cast<std::int64_t>(found.st_ino), static_cast<std::int64_t>(found.st_size),
          static_cast<std::int64_t>(found.st_mtim.tv_sec),
          static_cast<std::int64_t>(found.st_mtim.tv_nsec)}) {
      stamp += std::to_string(number) + " ";
    }
  }
  return stamp;
}

// `turns`: how often the daemon went or came back. A reading asks it how it does.
StoredReport::Source sourceOf(Tool& tool, const ServeOptions& options, const ValueMap& device,
                              const std::atomic<std::uint64_t>& turns) {
  const auto read = [&tool, &options, device](const std::stop_token& stop) {
    std::optional<ReportScope> scope = options.scope.scope(tool);  // again, because a span ends now
    scope->hasRunning = true;
    scope->stop = stop;
    ReportData report = readReport(tool, *scope, device);
    StoredReport::Reading reading;
    reading.data = std::move(report.data);
    reading.running = std::move(report.running);
    reading.problem = std::move(report.problem);
    return reading;
  };
  return {read, [&tool, &turns] { return stampOf(tool.directories().state) + std::to_string(turns); }};
}

void follow(DaemonWatch& daemon, StateSender& sender, StoredReport& stored, LiveFeed& feed,
            LiveEvents& events, std::atomic<std::uint64_t>& turns) {
  std::pair<std::uint64_t, std::uint64_t> remembered;
  for (;;) {
    const bool answered = daemon.answers();
    const steady_clock::time_point time = steady_clock::now();
    const double now = secondsSince1970();
    daemon.proceed(time, now);
    if (daemon.answers() != answered) ++turns;
    // Nobody reads the page, so nobody needs the store's news.
    if (feed.readers() > 0) stored.refresh();
    const std::shared_ptr<const StoredReport::Reading> newest = stored.newest();
    const std::pair state(newest->number, daemon.connections());
    if (state != remembered) daemon.remember(newest->running);
    remembered = state;
    if (daemon.hasAsked()) sender.send(daemon, *newest, time, now);
    auto next = std::min(daemon.nextStep(), steady_clock::now() + kTick);
    if (const auto held = sender.heldBackUntil()) next = std::min(next, *held);
    if (events.wait(daemon.fileDescriptor(), next) == LiveEvents::Event::kStopped) return;
  }
}

int serve(Tool& tool, const ServeOptions& options) {
  const std::optional<ReportScope> scope = options.scope.scope(tool);
  if (!scope) return tool.status;
  std::atomic<std::uint64_t> turns = 0;
  StoredReport stored(sourceOf(tool, options, reportedDevice(tool), turns));
  std::string problem = stored.readFirst();
  if (!problem.empty()) return tool.fail(kRefused, problem);
  const std::optional<std::string> token = newServeToken();
  if (!token) return tool.fail(kRefused, "serve: the system has no random numbers");

  LiveEvents events(-1, -1);  // before the address is printed, because a reader of it may send a signal
  LiveFeed feed;
  HttpServer server;
  problem = server.listen(options.port);
  if (!problem.empty()) return tool.fail(kRefused, "serve: " + problem);
  const RequestCheck check(server.port(), *token);
  const PageServer pages(check, stored, feed, secondsSince1970);
  problem = server.start([&pages](const PageRequest& request) { return pages.answer(request); });
  if (!problem.empty()) return tool.fail(kRefused, "serve: " + problem);
  stored.start();

  const std::string address = "http://127.0.0.1:" + std::to_string(server.port()) + "/?token=" + *token;
  tool.out << (tool.asJson ? "{\"address\":\"" + address + "\"}" : address) << '\n';
  if (tool.out.flush()) {
    DaemonWatch daemon(tool.socketPaths());
    StateSender sender(feed, scope->application);
    follow(daemon, sender, stored, feed, events, turns);
  }
  feed.end();
  server.stop();
  return kDone;
}

}  // namespace

void addServeCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "serve", "The page of report, live, for browsers on this device");
  command.footer(
      "Prints the address, which has a secret token, and serves until Ctrl-C. Only this device reaches it. "
      "The\n"
      "page shows what plays while it plays, and what the store has. It changes nothing. What plays is only\n"
      "for trusted users.\n" +
      std::string(TimeRangeOptions::kForms));
  const auto options = std::make_shared<ServeOptions>();
  command.add_option("--port", options->port, "The port (a free one)")->type_name("N");
  options->scope.addOpenEndTo(command);
  command.callback([&tool, options] { tool.status = serve(tool, *options); });
}

}  // namespace tonewerk
