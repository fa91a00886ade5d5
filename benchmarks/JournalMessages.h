// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "ClientMessages.h"

namespace tonewerk {

// Holds the messages of a plan as native journal messages: a datagram each, with the same entries as fields.
class JournalMessages {
 public:
  // A field that each of the messages has, and none of the journal's own.
  static constexpr const char* kField = "TWREPORTING_TIMESTAMP";

  explicit JournalMessages(const ClientMessagePlan& plan);

  // Sends `count` messages to the socket, beginning again at the end; waits while its queue is full. Throws
  // std::runtime_error on failure.
  void send(const std::string& socketPath, std::size_t count) const;

 private:
  std::vector<std::string> datagrams_;
};

// Reads all messages that are in the journal's files, and waits for more until it has read `count`. Throws
// std::runtime_error when they do not come.
void followJournal(const std::string& filesDirectory, std::size_t count);

}  // namespace tonewerk
