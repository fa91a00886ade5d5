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

// Clients of a server under measurement, all driven by one thread: each has a session and sends messages to
// it, with a bounded number of requests under way.
//
// A failure, and an answer that is an error, throws std::runtime_error: a benchmark whose messages were
// refused has measured nothing.
class IngestClients {
 public:
  // Connects `count` clients to the socket and starts a session of that service for each.
  IngestClients(const std::string& socketPath, std::size_t count, IngestMessages::Kind kind,
                std::int64_t serviceType);

  struct Pace {
    std::size_t window;          // requests under way, a client
    std::size_t messagesAWrite;  // at most
  };
  // Every client sends so many messages, and all are answered.
  void send(std::size_t messagesAClient, const Pace& pace);
  // Stops the sessions.
  void stop();

 private:
  struct Client {
    FileDescriptor socket;
    IngestMessages messages;
    std::string unsent;     // of the message that the socket took a part of
    std::size_t place = 0;  // of the next message in `messages`, which are sent again and again
    std::size_t sent = 0;
    std::size_t answered = 0;
    std::string answers;  // the start of one that is not whole yet
  };

  void ask(Client& client, const std::string& bytes);
  void sendSome(Client& client, std::size_t messages, const Pace& pace);
  [[nodiscard]] bool write(Client& client);
  void takeAnswers(Client& client);

  std::vector<Client> clients_;
};

}  // namespace tonewerk
