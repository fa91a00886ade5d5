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

namespace tonewerk {

// What a client got back.
struct MemoryResponse {
  std::uint32_t identifier = 0;
  std::optional<ReplyError> error;
  std::optional<Value> result;
};

// The client's end of a connection made by MemoryMessaging. The messaging thread is whichever thread calls
// request(), notify() and disconnect(); tests use one. The rest is for any thread.
class MemoryClient {
 public:
  MemoryClient(const MemoryClient&) = delete;
  MemoryClient& operator=(const MemoryClient&) = delete;
  // Disconnects.
  ~MemoryClient();

  // Sends a request and returns its identifier. A method or arguments that the exported interface does not
  // know are answered with the messaging layer's errors. Goes nowhere once the connection has ended.
  std::uint32_t request(std::string_view method, Arguments arguments);
  // The same, never answered.
  void notify(std::string_view method, Arguments arguments);

  // Ends the connection: its handlers have returned when this does. Once; later calls do nothing.
  void disconnect();
  bool hasEnded() const;

  // Everything answered so far, in order. A request may be answered several times.
  std::vector<MemoryResponse> responses() const;
  // The first answer to this request, none so far being null. With a queue of its own behind the exported
  // object, waitForResponses() says when to look.
  std::optional<MemoryResponse> responseTo(std::uint32_t identifier) const;
  // Returns true as soon as there are `count` answers, false when that has not happened within `timeout`.
  [[nodiscard]] bool waitForResponses(std::size_t count,
                                      std::chrono::milliseconds timeout = std::chrono::seconds(30)) const;

  // Requests whose bodies have not run yet.
  std::size_t unfinishedRequests() const;

 private:
  friend class MemoryMessaging;
  class Connection;
  explicit MemoryClient(std::shared_ptr<Connection> connection);

  std::shared_ptr<Connection> connection_;
  std::uint32_t nextIdentifier_ = 1;
};

// A MessagingListener in memory, for one process that plays both sides.
class MemoryMessaging final : public MessagingListener {
 public:
  MemoryMessaging();
  ~MemoryMessaging() override;

  void setDelegate(MessagingListenerDelegate& delegate) override { delegate_ = &delegate; }
  void resume() override { isAccepting_ = true; }
  void shutDown() override;

  // The user that the daemon runs as.
  static constexpr std::uint32_t kOwner = 500;

  // A client process of that user connects. Null when nobody listens or the delegate turns it away.
  [[nodiscard]] std::unique_ptr<MemoryClient> connect(std::int32_t processIdentifier = 1000,
                                                      std::uint32_t userIdentifier = kOwner);

 private:
  MessagingListenerDelegate* delegate_ = nullptr;
  bool isAccepting_ = false;
  std::vector<std::weak_ptr<MemoryClient::Connection>> connections_;
};

}  // namespace tonewerk
