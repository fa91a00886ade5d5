// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>

#include "platform/Messaging.h"
#include "tools/recording/Recording.h"

namespace tonewerk {

class Account;

// The connections of a recording's clients to a service in the same process. One thread.
class OfflineConnections {
 public:
  // Called for each request that was refused.
  using Refusal = std::function<void(const RecordedStep& call, const ReplyError& error)>;

  // `delegate` and the steps of the recording outlive it.
  OfflineConnections(MessagingListenerDelegate& delegate, Refusal refusal);
  OfflineConnections(const OfflineConnections&) = delete;
  OfflineConnections& operator=(const OfflineConnections&) = delete;
  // Drops the connections without their handlers.
  ~OfflineConnections();

  bool has(std::int64_t client) const { return connections_.contains(client); }
  void connect(std::int64_t client, std::int32_t process, std::shared_ptr<Account> account);
  // `now`: seconds since 1970. The client is connected.
  void send(const RecordedStep& call, double now);
  // Ends the connection with both its handlers.
  void disconnect(std::int64_t client);
  // Of those that are connected, the client that connected first.
  std::optional<std::int64_t> first() const;

 private:
  class Connection;

  MessagingListenerDelegate& delegate_;
  const Refusal refusal_;
  std::map<std::int64_t, std::shared_ptr<Connection>> connections_;
  std::uint64_t connected_ = 0;  // so many so far
};

}  // namespace tonewerk
