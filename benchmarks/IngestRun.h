// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <string>

#include "IngestMessages.h"

namespace tonewerk {

// Describes the messages that are sent to a server.
struct IngestScenario {
  std::string name;
  std::size_t clients;
  IngestMessages::Kind kind;
  std::size_t window;          // pending requests per client
  std::size_t messagesAWrite;  // maximum; the client library writes each message separately
  std::size_t messages;        // measured messages of all clients together
  std::size_t storedBefore;    // messages before the measured ones, of all clients together
  // Each message is also recorded by the real-time-communication worker, as a second row.
  bool recordsCalls = false;
};

enum class IngestServer {
  kDaemon,  // writes analytics events to its store, and summary files
  kFloor,
};

// Holds the cost of a scenario. Processor time is that of the server only, until the store has written
// everything.
struct IngestCost {
  using Microseconds = std::chrono::duration<double, std::micro>;

  Microseconds processorTime{};  // per message
  double messagesPerSecond = 0.0;
  Microseconds stopTime{};                      // processor time of the sessions' stop, per received message
  std::size_t peakMemory = 0;                   // in bytes, stop included
  std::map<std::string, Microseconds> threads;  // processorTime by thread
};

// Runs the scenario once with a new server. Throws std::runtime_error when the server did not take all
// messages.
IngestCost measureIngest(const IngestScenario& scenario, IngestServer side);

}  // namespace tonewerk
