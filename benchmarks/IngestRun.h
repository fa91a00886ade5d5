// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <string>

#include "IngestMessages.h"

namespace tonewerk {

// What is sent to a server.
struct IngestScenario {
  std::string name;
  std::size_t clients;
  IngestMessages::Kind kind;
  std::size_t window;          // requests under way, a client
  std::size_t messagesAWrite;  // at most; a client library writes each by itself
  std::size_t messages;        // measured ones, of all clients together
  std::size_t storedBefore;    // messages that come before the measured ones, likewise
  // A session's real-time-communication records are a second row a message.
  bool recordsCalls = false;
};

enum class IngestSide {
  kDaemon,  // recording analytics events in its store, and summary files
  kFloor,
};

// What that cost. Processor time is the server's alone, up to where the store has written everything.
struct IngestCost {
  using Microseconds = std::chrono::duration<double, std::micro>;

  Microseconds processorTime{};  // a message
  double messagesPerSecond = 0.0;
  Microseconds stopTime{};                      // processor time of the sessions' stop, a message that came
  std::size_t peakMemory = 0;                   // bytes, the stop included
  std::map<std::string, Microseconds> threads;  // processorTime by thread
};

// Runs the scenario once against a fresh server. Throws std::runtime_error when it did not take everything.
IngestCost measureIngest(const IngestScenario& scenario, IngestSide side);

}  // namespace tonewerk
