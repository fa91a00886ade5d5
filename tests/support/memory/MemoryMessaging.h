// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <vector>

#include "platform/Messaging.h"
#include "platform/accounts/Accounts.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {

// An answer that a client received.
struct MemoryResponse {
  std::uint32_t identifier = 0;
  std::optional<ReplyError> error;
  std::optional<Value> result;
};

// The client's end of a connection made by MemoryMessaging. The thread that calls request(), notify() and
// disconnect() is the messaging thread; a test uses only one. Any thread may call the other functions.
class MemoryClient {
 public:
  MemoryClient(const MemoryClient&) = delete;
  MemoryClient& operator=(const MemoryClient&) = delete;
  // Disconnects.
  ~MemoryClient();

  // Sends a request and returns its identifier. A method or arguments that the request set does not allow are
  // answered with the messaging layer's errors. After the connection has ended the request is dropped.
  std::uint32_t request(std::string_view method, Arguments arguments);
  // Sends a request that is never answered.
  void notify(std::string_view method, Arguments arguments);

  // Ends the connection. Its handlers have returned when this returns. Later calls do nothing.
  void disconnect();
  bool hasEnded() const;

  // Returns all answers so far, in order. A request may have several answers.
  std::vector<MemoryResponse> responses() const;
  // Returns the first answer to this request; none when there is no answer yet. When the request handler uses
  // a queue of its own, waitForResponses() waits for the answers.
  std::optional<MemoryResponse> responseTo(std::uint32_t identifier) const;
  // Returns true as soon as there are `count` answers, and false when there are fewer after `timeout`.
  [[nodiscard]] bool waitForResponses(std::size_t count,
                                      std::chrono::milliseconds timeout = std::chrono::seconds(30)) const;

  // Returns the number of requests whose bodies have not run yet.
  std::size_t unfinishedRequests() const;

 private:
  friend class MemoryMessaging;
  class Connection;
  explicit MemoryClient(std::shared_ptr<Connection> connection);

  std::shared_ptr<Connection> connection_;
  std::uint32_t nextIdentifier_ = 1;
};

// A MessagingListener in memory, for a process that is both client and daemon.
class MemoryMessaging final : public MessagingListener {
 public:
  // Without `accounts` it has its own. They outlive it.
  explicit MemoryMessaging(Accounts* accounts = nullptr);
  ~MemoryMessaging() override;

  void setDelegate(MessagingListenerDelegate& delegate) override { delegate_ = &delegate; }
  void resume() override { isAccepting_ = true; }
  void shutDown() override;

  // The user that the daemon runs as.
  static constexpr std::uint32_t kOwner = 500;

  // Connects a client process of that user. Returns null when nobody listens or the delegate refuses it.
  [[nodiscard]] std::unique_ptr<MemoryClient> connect(std::int32_t processIdentifier = 1000,
                                                      std::uint32_t userIdentifier = kOwner);

 private:
  const ManualClock clock_;
  std::optional<Accounts> own_;
  Accounts& accounts_;
  MessagingListenerDelegate* delegate_ = nullptr;
  bool isAccepting_ = false;
  std::vector<std::weak_ptr<MemoryClient::Connection>> connections_;
};

}  // namespace tonewerk
