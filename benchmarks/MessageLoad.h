// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "IngestClients.h"
#include "ServerProcess.h"

namespace tonewerk {

// Describes clients and the messages that they send to a server.
struct MessageLoad {
  std::size_t clients = 1;
  std::size_t sessions = 10;  // of all clients together
  IngestClients::Pace pace{256, 1};
  std::size_t messages = 0;  // of all clients together, at least
  bool allChange = false;
};

// Long-form audio, whose sessions have all workers that audio clients cause.
inline constexpr std::int64_t kMeasuredService = 7;
inline constexpr std::int64_t kFirstReporterID = 100;

std::vector<IngestClientPlan> plansOf(const MessageLoad& load);

struct MessageCost {
  double microseconds = 0.0;  // processor time of the server per message, until it is idle again
  std::size_t messages = 0;   // sent
};

// Sends the messages, or a few more, so that all clients send as many.
MessageCost measureMessages(const ServerProcess& server, IngestClients& clients, const MessageLoad& load);

}  // namespace tonewerk
