// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>

#include "platform/Journal.h"
#include "platform/Messaging.h"
#include "platform/linux/journal/PlayedClock.h"
#include "platform/linux/messagepack/RpcFrameDecoder.h"

namespace tonewerk {

class Accounts;

// Plays a journal after a crash: each client in it connects to the service again, and its requests run again
// at their times.
//
// play() and endAll() are one piece of the work queue's work. In between nothing else runs there.
class JournalPlayer {
 public:
  // What the player needs of the service beside connections. All are called on the playing thread.
  struct Hooks {
    // The record's request runs next.
    std::function<void(const Journal::Record&)> begins;
    std::function<void(std::uint32_t user)> endSingleMessages;
    // So many records have been played. Called after each, and after the end of each client.
    std::function<void(std::uint64_t records)> progress;
  };

  // All references outlive the object.
  JournalPlayer(Journal& journal, MessagingListenerDelegate& service, Accounts& accounts, Hooks hooks);
  JournalPlayer(const JournalPlayer&) = delete;
  JournalPlayer& operator=(const JournalPlayer&) = delete;
  ~JournalPlayer();

  Journal::Reading play();
  // The clients that have not disconnected.
  std::size_t openClients() const { return connections_.size(); }
  // Ends their connections, in the order in which they came, at the time of the last record.
  void endAll();

 private:
  class Connection;

  void playRecord(const Journal::Record& record);
  void connect(const Journal::Record& record);
  void disconnect(const Journal::Record& record);
  void request(const Journal::Record& record);

  Journal& journal_;
  MessagingListenerDelegate& service_;
  Accounts& accounts_;
  const Hooks hooks_;
  PlayedClock::Time time_;
  std::map<std::uint64_t, std::unique_ptr<Connection>> connections_;  // by the client's number
  RpcFrameDecoder decoder_;
  std::uint64_t played_ = 0;
};

}  // namespace tonewerk
