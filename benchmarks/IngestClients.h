// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "IngestMessages.h"
#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Describes one client: its sessions have consecutive identifiers.
struct IngestClientPlan {
  std::int64_t firstReporterID;
  std::size_t sessions;
  IngestMessages messages;
};

// Runs the clients of a measured server, all on one thread. Each client has sessions and sends messages to
// them, with a limited number of requests pending.
//
// A failure or an error answer throws std::runtime_error, because a benchmark whose messages were refused has
// measured nothing.
class IngestClients {
 public:
  // Connects a client for each plan to the socket and starts its sessions, of service `serviceType`.
  IngestClients(const std::string& socketPath, std::vector<IngestClientPlan> plans, std::int64_t serviceType);

  struct Pace {
    std::size_t window;          // pending requests per client
    std::size_t messagesAWrite;  // maximum
  };
  // Sends `messagesAClient` messages from every client and waits for all answers.
  void send(std::size_t messagesAClient, const Pace& pace);
  // Stops the sessions.
  void stop();

  // The number of messages sent so far that are not redundant.
  std::size_t stored() const { return stored_; }

 private:
  struct Client {
    FileDescriptor socket;
    IngestClientPlan plan;
    std::string unsent;     // the bytes that the socket has not taken yet
    std::size_t place = 0;  // of the next of the plan's messages, which are sent repeatedly
    std::size_t sent = 0;
    std::size_t answered = 0;
    std::string answers;  // the beginning of an answer that is not complete yet
  };

  void request(Client& client, const std::string& bytes);
  void sendSome(Client& client, std::size_t messages, const Pace& pace);
  [[nodiscard]] bool write(Client& client);
  void takeAnswers(Client& client);

  std::vector<Client> clients_;
  std::size_t stored_ = 0;
};

}  // namespace tonewerk
