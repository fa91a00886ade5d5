// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <thread>
#include <unordered_map>

#include "platform/Messaging.h"
#include "platform/linux/descriptors/Epoll.h"
#include "platform/linux/messaging/Slab.h"
#include "platform/linux/socket/ServerSocket.h"
#include "platform/linux/socket/UnixConnection.h"
#include "platform/linux/system/WatchdogFeeder.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/Mutex.h"

namespace tonewerk {

// Serves clients over a Unix socket, all of them on one thread of its own, the messaging thread.
//
// In every round each connection that is ready is read once, so that no client can keep the others waiting.
// At least kReservedDescriptors (or half of all, if that is less) are left for the daemon's own files.
// Further clients wait in the socket's backlog.
class UnixSocketListener final : public MessagingListener {
 public:
  static constexpr std::size_t kReservedDescriptors = 64;
  // When the system has no descriptor for another client, the listener tries again after this time or when a
  // connection has ended.
  static constexpr std::chrono::milliseconds kAcceptPause{1000};

  // `log`, `accounts` and `memory` outlive the listener. The messaging thread feeds `watchdog`; without one
  // it wakes up only for clients. `memory` learns how many bytes clients send and when a client is gone. It
  // may be null.
  UnixSocketListener(std::unique_ptr<ServerSocket> socket, const LogCategory& log, Accounts& accounts,
                     std::unique_ptr<WatchdogFeeder> watchdog = nullptr,
                     AllocatorReclaimer* memory = nullptr);
  ~UnixSocketListener() override;

  void setDelegate(MessagingListenerDelegate& delegate) override { delegate_ = &delegate; }
  void resume() override;
  void shutDown() override;

  // Any thread. Makes the messaging thread recreate the socket if its file is gone. Connections continue. A
  // failure is logged.
  void restoreSocket();

 private:
  // Identifiers in the epoll. Connections have higher ones.
  static constexpr std::uint64_t kSocket = 0;
  static constexpr std::uint64_t kWaker = 1;

  void run();
  void handle(const Epoll::Event& event);
  void handleWakes();
  void accept();
  void recreateSocket();
  void add(FileDescriptor socket);
  void pauseAccepting(const std::string& why);
  void resumeAccepting();
  // Adds the listening socket to the epoll. If that fails it pauses accepting, and so tries again later.
  void watchSocket();
  std::optional<std::chrono::milliseconds> timeToNextAccept() const;
  std::optional<std::chrono::milliseconds> timeToNextRound() const;
  void removeIfEnded(std::uint64_t identifier);
  void endAll();

  std::unique_ptr<ServerSocket> socket_;
  const LogCategory& log_;
  MessagingListenerDelegate* delegate_ = nullptr;

  // Used by the messaging thread only.
  Epoll epoll_;
  const std::shared_ptr<IoWaker> waker_ = std::make_shared<IoWaker>();
  SlabPool slabs_;
  const UnixConnectionContext context_;
  const std::unique_ptr<WatchdogFeeder> watchdog_;  // null without a watchdog
  const std::size_t maxConnections_;
  std::unordered_map<std::uint64_t, std::unique_ptr<UnixConnection>> connections_;
  std::uint64_t nextIdentifier_ = kWaker + 1;
  std::optional<std::chrono::steady_clock::time_point> acceptAgainAt_;  // set while accepting is paused
  bool hasLoggedPause_ = false;

  Mutex lifeMutex_;  // held by resume() and shutDown()
  std::atomic<bool> isStopping_ = false;
  std::atomic<bool> mustRestore_ = false;
  std::thread thread_ GUARDED_BY(lifeMutex_);
};

}  // namespace tonewerk
