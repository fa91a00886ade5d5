// SPDX-License-Identifier: Apache-2.0
#include "IngestRun.h"

#include <fstream>
#include <stdexcept>

#include "IngestClients.h"
#include "ServerProcess.h"
#include "platform/linux/store/SqliteDatabase.h"

namespace tonewerk {
namespace {

constexpr std::size_t kFillWindow = 256;
// Different messages of each client. They are then sent again; for the server they are new messages.
constexpr std::size_t kDifferentMessages = 4096;
constexpr std::int64_t kFirstReporterID = 100;

// Service types. A session of the test service has all workers but the one of real-time communication.
constexpr std::int64_t kLongFormAudio = 7;
constexpr std::int64_t kTest = 11;

void start(ServerProcess& server, IngestServer side) {
  if (side == IngestServer::kFloor) return server.start(TONEWERK_FLOOR, {server.socketPath()});
  // On internal builds every session also gets a summary file.
  std::ofstream(server.configurationDirectory() + "/device-facts.toml") << "InternalBuild = true\n";
  server.start(TONEWERK_DAEMON, {});
}

// Checks that the daemon has recorded the messages; otherwise the measured work was not done.
void checkStore(const ServerProcess& server, std::size_t wanted) {
  SqliteDatabase database;
  std::optional<std::int64_t> rows;
  if (database.open(server.stateDirectory() + "/reports.db", SqliteDatabase::Mode::kReadOnly,
                    std::chrono::seconds(1))) {
    rows = database.number("SELECT count(*) FROM analytics_row");
  }
  if (!rows || static_cast<std::size_t>(*rows) < wanted) {
    throw std::runtime_error("the store holds " + std::to_string(rows.value_or(0)) + " rows, not " +
                             std::to_string(wanted));
  }
}

std::size_t rowsOf(const IngestScenario& scenario) {
  return scenario.kind == IngestMessages::Kind::kRepeated ? scenario.clients
                                                          : scenario.messages + scenario.storedBefore;
}

std::vector<IngestClientPlan> plansOf(const IngestScenario& scenario) {
  std::vector<IngestClientPlan> plans;
  for (std::size_t at = 0; at < scenario.clients; ++at) {
    const std::int64_t reporterID = kFirstReporterID + static_cast<std::int64_t>(at);
    plans.push_back({reporterID, 1, IngestMessages::playback(scenario.kind, reporterID, kDifferentMessages)});
  }
  return plans;
}

}  // namespace

IngestCost measureIngest(const IngestScenario& scenario, IngestServer side) {
  ServerProcess server;
  start(server, side);
  IngestClients clients(server.socketPath(), plansOf(scenario),
                        scenario.recordsCalls ? kLongFormAudio : kTest);
  clients.send(scenario.storedBefore / scenario.clients, {kFillWindow, kFillWindow});
  server.waitUntilIdle();

  const auto messages = static_cast<double>(scenario.messages);
  const ServerProcess::Processor before = server.processorTime();
  const auto threadsBefore = server.processorTimeByThread();
  const auto startedAt = std::chrono::steady_clock::now();
  clients.send(scenario.messages / scenario.clients, {scenario.window, scenario.messagesAWrite});
  const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - startedAt;
  server.waitUntilIdle();

  IngestCost cost;
  const ServerProcess::Processor after = server.processorTime();
  cost.processorTime = IngestCost::Microseconds(after - before) / messages;
  cost.messagesPerSecond = messages / elapsed.count();
  for (auto& [name, time] : server.processorTimeByThread()) {
    const auto known = threadsBefore.find(name);
    const auto earlier = known == threadsBefore.end() ? ServerProcess::Processor(0) : known->second;
    cost.threads[name] = IngestCost::Microseconds(time - earlier) / messages;
  }
  if (side == IngestServer::kDaemon) checkStore(server, rowsOf(scenario));
  clients.stop();
  server.waitUntilIdle();
  cost.stopTime = IngestCost::Microseconds(server.processorTime() - after) /
                  (messages + static_cast<double>(scenario.storedBefore));
  cost.peakMemory = server.peakMemory();
  return cost;
}

}  // namespace tonewerk
