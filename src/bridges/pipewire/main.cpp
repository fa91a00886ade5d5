// SPDX-License-Identifier: Apache-2.0
// tw-pipewire: reports the output streams of a PipeWire graph to the reporting daemon.
#include <CLI/CLI.hpp>
#include <csignal>
#include <cstdio>
#include <filesystem>
#include <pipewire/pipewire.h>
#include <unistd.h>

#include "bridges/pipewire/drivers/DriverReports.h"
#include "bridges/pipewire/drivers/KernelFacts.h"
#include "bridges/pipewire/drivers/LeavingStreams.h"
#include "bridges/pipewire/drivers/PublishingSessionSink.h"
#include "bridges/pipewire/graph/PipeWireGraph.h"
#include "bridges/pipewire/sessions/DaemonLink.h"
#include "bridges/pipewire/sessions/StreamReports.h"
#include "platform/linux/threads/SystemClock.h"

namespace tonewerk {
namespace {

constexpr int kWrongUsage = 2;

// How long the bridge waits, before it ends, for the daemon to take the last messages.
constexpr std::chrono::milliseconds kFinishTimeout{3000};

int runBridge(const Console& console) {
  const std::unique_ptr<PipeWireLoop> loop = PipeWireLoop::make();
  if (loop == nullptr) {
    console.say("cannot make an event loop");
    return 1;
  }
  const auto quit = [&loop] { loop->quit(); };
  const auto terminate = loop->watchSignal(SIGTERM, quit);
  const auto interrupt = loop->watchSignal(SIGINT, quit);

  const SystemClock clock;
  ReporterIdentifiers identifiers(clock, getpid());
  DaemonLink daemon(*loop, console);
  // The bridges of several users may report to one daemon, so each publishes a file of its own.
  const std::string user = std::to_string(getuid());
  DriverStatistics statistics;
  const GlitchReports* nodes = nullptr;
  ChannelPublisher publisher(*loop, clock, console, "tw-pipewire-" + user + ".json", [&] {
    return statistics.channelsOf("PipeWire<" + user + ">",
                                 nodes == nullptr ? std::vector<NodeLoad>() : nodes->loads());
  });
  PublishingSessionSink sessions(daemon, publisher);
  StreamReports reports(sessions, clock, identifiers, *loop);
  LeavingStreams leaving(reports);
  GraphModel model(leaving);
  const LinuxKernelCalls kernel;
  KernelSampler sampler(kernel);
  KernelFacts facts(*loop, clock, sampler);
  GlitchReports glitches(model, reports, facts, clock);
  leaving.tell(&glitches);
  nodes = &glitches;
  DriverReports drivers(model, statistics, glitches, publisher);
  {
    PipeWireGraph graph(*loop, model, drivers, console);
    const auto onConnected = [&](DaemonLink::Connection connection) {
      publisher.open(std::filesystem::path(daemon.socketPath()).parent_path());
      if (connection == DaemonLink::Connection::kFirst) {
        reports.restartAll();
      } else {
        reports.resendAll();
      }
    };
    if (!daemon.open(onConnected)) {
      console.say("cannot look for the reporting daemon: no memory or no descriptors");
      return 1;
    }
    if (!graph.open()) {
      console.say("cannot use PipeWire: its client configuration is missing or broken");
      return 1;
    }
    loop->run();
  }
  // The graph is no longer watched, so the sessions of streams that still play end here.
  model.clear();
  leaving.tell(nullptr);
  if (daemon.isConnected() && !daemon.finish(kFinishTimeout)) console.say("the daemon took not everything");
  // After finish(), because the daemon reads the channels when a session stops.
  publisher.withdraw();
  return 0;
}

}  // namespace
}  // namespace tonewerk

int main(int argc, char** argv) {
  CLI::App app(
      "Reports what plays in a PipeWire graph: each output stream as a session of the reporting daemon.\n"
      "Waits for both daemons, and follows them when they restart. Ends on SIGTERM or SIGINT.");
  app.footer(
      "Environment:\n"
      "  TONEWERK_REPORTING_SOCKET  the reporting daemon's socket\n"
      "  PIPEWIRE_REMOTE            which PipeWire");
  app.set_version_flag("--version", "tw-pipewire " TONEWERK_VERSION);
  bool verbose = false;
  app.add_flag("-v,--verbose", verbose, "Say what is reported, on standard error");
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    // --help and --version also throw, with status 0.
    return app.exit(error) == 0 ? 0 : tonewerk::kWrongUsage;
  }

  pw_init(nullptr, nullptr);
  const int status = tonewerk::runBridge(tonewerk::Console(verbose));
  pw_deinit();
  return status;
}
