// SPDX-License-Identifier: Apache-2.0
#include "MessageLoad.h"

#include <algorithm>
#include <chrono>

#include "ClientMessages.h"

namespace tonewerk {
namespace {

// Different messages of all clients together, at least.
constexpr std::size_t kDifferentMessages = 4'000;

std::size_t roundsOf(const MessageLoad& load) {
  const std::size_t rounds = std::max(kDifferentMessages / load.sessions, kClientMessageRounds);
  return rounds - rounds % kClientMessageRounds;
}

}  // namespace

std::vector<IngestClientPlan> plansOf(const MessageLoad& load) {
  std::vector<IngestClientPlan> plans;
  std::int64_t reporterID = kFirstReporterID;
  for (std::size_t client = 0; client < load.clients; ++client) {
    // The first clients have one session more when the division has a rest.
    const std::size_t sessions =
        load.sessions / load.clients + (client < load.sessions % load.clients ? 1 : 0);
    plans.push_back(
        {reporterID, sessions, clientMessages({reporterID, sessions, roundsOf(load), load.allChange})});
    reporterID += static_cast<std::int64_t>(sessions);
  }
  return plans;
}

MessageCost measureMessages(const ServerProcess& server, IngestClients& clients, const MessageLoad& load) {
  using Microseconds = std::chrono::duration<double, std::micro>;
  const std::size_t each = (load.messages + load.clients - 1) / load.clients;
  server.waitUntilIdle();
  const ServerProcess::Processor before = server.processorTime();
  clients.send(each, load.pace);
  server.waitUntilIdle();
  const Microseconds time = server.processorTime() - before;
  const std::size_t messages = each * load.clients;
  return {time.count() / static_cast<double>(messages), messages};
}

}  // namespace tonewerk
