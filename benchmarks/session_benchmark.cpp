// SPDX-License-Identifier: Apache-2.0
//
// Measures the cost of a session's life without messages: created, started, stopped, destroyed. Once in the
// core on in-memory doubles, and once for the daemon, through its socket and with its own adapters.

#include <algorithm>
#include <array>
#include <benchmark/benchmark.h>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/socket.h>
#include <vector>

#include "QuietDoubles.h"
#include "ServerProcess.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "support/TestPlatform.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

constexpr ReporterID kReporterID = 77;

// One session's life in the core.
void InCore(benchmark::State& state) {
  TestPlatform doubles;
  QuietLog log;
  SilentTracePoints tracePoints;
  RunningClock clock;
  ImmediateQueues queues;
  CountingMetricon metricon;
  QuietLinkReport linkReport;
  TWReportingContext context(doubles.platformWith(log, tracePoints, clock, queues, metricon, linkReport),
                             allWorkerClasses());
  const auto budget = std::make_shared<KeptBytesBudget>();
  for (auto _ : state) {
    const auto session = TWReportingSession::initWithID(kReporterID, {4711}, budget);
    session->start();
    session->stop();
  }
  // A stopped session sends its summary.
  if (metricon.events == 0) state.SkipWithError("no session has reported");
}
BENCHMARK(InCore);

// A client that sends the same bytes again and again, and waits for their answers.
class LifeClient {
 public:
  explicit LifeClient(const std::string& socketPath)
      : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    const auto address = unixAddressOf(socketPath);
    if (!address || ::connect(socket_.get(), generic(*address), sizeof(*address)) != 0) {
      throw std::runtime_error("cannot connect to " + socketPath + ": " + std::strerror(errno));
    }
  }

  // Sends the lives of `count` sessions in one write, and waits until all have ended.
  void live(std::size_t count) {
    const std::string bytes = requestsOf(count);
    if (::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL) !=
        static_cast<ssize_t>(bytes.size())) {
      throw std::runtime_error(std::string("send: ") + std::strerror(errno));
    }
    std::array<char, 16384> answers;
    for (std::size_t wanted = count * kRequests * kAnswerBytes; wanted > 0;) {
      const ssize_t received = ::recv(socket_.get(), answers.data(), std::min(wanted, answers.size()), 0);
      if (received <= 0) throw std::runtime_error("the daemon has stopped answering");
      wanted -= static_cast<std::size_t>(received);
    }
  }

 private:
  static constexpr std::size_t kRequests = 4;
  // Every identifier takes five bytes, so that every answer "true" is as long as the others.
  static constexpr std::uint32_t kFirstIdentifier = 0x10000;
  static constexpr std::size_t kAnswerBytes = 9;

  static std::string requestsOf(std::size_t count) {
    std::string bytes;
    RpcWriter writer(bytes);
    std::uint32_t identifier = kFirstIdentifier;
    for (std::size_t at = 0; at < count; ++at) {
      const Value session(kReporterID + static_cast<ReporterID>(at));
      for (const char* method : {"createReportingSession", "startReportingSessionForID",
                                 "stopReportingSessionForID", "destroyReportingSession"}) {
        writer.request(identifier++, method, {session});
      }
    }
    return bytes;
  }

  FileDescriptor socket_;
};

// Processor time of the daemon for a session's life: of all its threads, in user and kernel mode, until it is
// idle again and the store has recorded what the session reported when it stopped. The counters show where it
// was spent, in microseconds by thread.
void InDaemon(benchmark::State& state) {
  using Microseconds = std::chrono::duration<double, std::micro>;
  constexpr std::size_t kLives = 8192;
  const auto livesAWrite = static_cast<std::size_t>(state.range(0));
  ServerProcess server;
  server.start(TONEWERK_DAEMON, {});
  LifeClient client(server.socketPath());
  client.live(livesAWrite);
  for (auto _ : state) {
    server.waitUntilIdle();
    const ServerProcess::Processor before = server.processorTime();
    auto threadsBefore = server.processorTimeByThread();
    for (std::size_t at = 0; at < kLives; at += livesAWrite) client.live(livesAWrite);
    server.waitUntilIdle();
    const Microseconds spent = (server.processorTime() - before) / static_cast<double>(kLives);
    state.SetIterationTime(std::chrono::duration<double>(spent).count());
    for (const auto& [name, time] : server.processorTimeByThread()) {
      const Microseconds ofThread = (time - threadsBefore[name]) / static_cast<double>(kLives);
      if (ofThread.count() >= 0.1) state.counters[name] = ofThread.count();
    }
  }
}
BENCHMARK(InDaemon)->ArgName("a_write")->Arg(1)->Arg(64)->UseManualTime()->Iterations(1)->Unit(
    benchmark::kMicrosecond);

}  // namespace
}  // namespace tonewerk

BENCHMARK_MAIN();
