// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "protocol/RequestSet.h"
#include "support/client/ReportingClient.h"

namespace tonewerk {

// A client that uses as much of the daemon as it can get. It keeps its connections until it is destroyed.
//
// Every message is an error, which is never redundant, and a notification, so that the daemon cannot make
// the client wait for answers. What the daemon refuses it does not say then. A failure, such as that the
// daemon has ended a connection, throws std::runtime_error. One thread.
class Attacker {
 public:
  static constexpr std::int64_t kFirstReporterID = 1'000'000;

  explicit Attacker(std::string socketPath) : socketPath_(std::move(socketPath)) {}

  // Opens a connection with so many started sessions, from kFirstReporterID on, and returns when the daemon
  // has started them.
  void openSessions(std::size_t count);
  // Sends, on the connection with sessions:
  // a message of `bytes` that names the first session `times` times;
  void sendToOneSessionOften(std::size_t bytes, std::size_t times);
  // a message of `bytes` for all started sessions;
  void broadcast(std::size_t bytes);
  // a message of `bytes` for the first session, which is never redundant;
  void sendLarge(std::size_t bytes);
  // nearly a frame full of small arrays, which need many times their bytes as a tree;
  void sendNested();
  // a small message that names `count` sessions that do not exist.
  void nameUnknown(std::size_t count);

  // Opens so many connections, with a started session each, and makes their messages.
  void openFlood(std::size_t connections);
  // Floods the daemon with small messages over these, for ever.
  [[noreturn]] void flood();

  // Opens so many connections and sends most of a frame over each, an endless array of small arrays; until
  // the daemon takes no more. Returns the bytes that it has taken.
  std::size_t leaveUnfinished(std::size_t connections);

  // Opens connections until the daemon lets nobody in any more, at most so many. Returns how many it answers.
  std::size_t connectAsOftenAsPossible(std::size_t most);

  // Sends a request on a new connection and waits for the answer. None when the daemon ends the connection
  // instead.
  std::optional<Answer> ask(std::string_view method, const Arguments& arguments);

  // Waits until the daemon has done what this connection has asked for.
  void waitUntilServed();

 private:
  using Client = std::unique_ptr<ReportingClient>;

  Client connect() const;
  void send(std::string_view bytes);
  void sendMessage(ValueMap message, const std::vector<std::int64_t>& reporterIDs);

  const std::string socketPath_;
  Client client_;                    // the connection with sessions
  std::vector<Client> others_;       // openFlood() opens them in the order of their sessions
  std::vector<std::string> floods_;  // what each of them sends
  std::int64_t sent_ = 0;
};

}  // namespace tonewerk
