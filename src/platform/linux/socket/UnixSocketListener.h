// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <system_error>
#include <thread>
#include <unordered_map>
#include <vector>

#include "platform/Messaging.h"
#include "platform/linux/descriptors/Epoll.h"
#include "platform/linux/socket/ServerSocket.h"
#include "platform/linux/socket/UnixConnection.h"
#include "platform/linux/socket/UserIntake.h"
#include "platform/linux/system/WatchdogFeeder.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/Mutex.h"

namespace tonewerk {

class Accounts;

// Serves clients over a Unix socket, all of them on one thread of its own, the messaging thread.
//
// Connections that are ready are read once each, and the users take turns, so that no client can keep the
// others waiting. A user gets its share of the connections; a further one is closed at once.
//
// At least kReservedDescriptors (or half of all, if that is less) are left for the daemon's own files.
// Further clients wait in the socket's backlog.
class UnixSocketListener final : public MessagingListener {
 public:
  static constexpr std::size_t kReservedDescriptors = 64;
  // When the system has no descriptor for another client, the listener tries again after this time or when a
  // connection has ended.
  static constexpr std::chrono::milliseconds kAcceptPause{1000};
  // After this time connections whose users had no room look again.
  static constexpr std::chrono::milliseconds kRoomPause{1000};

  // `log`, `accounts` and `memory` outlive the listener. The messaging thread feeds `watchdog`; without one
  // it wakes up only for clients. `memory` learns how many bytes clients send and when a client is gone. It
  // may be null. `beforeReplies` is called on any thread before answers are sent.
  UnixSocketListener(std::unique_ptr<ServerSocket> socket, const LogCategory& log, Accounts& accounts,
                     std::unique_ptr<WatchdogFeeder> watchdog = nullptr, AllocatorReclaimer* memory = nullptr,
                     std::function<void()> beforeReplies = {});
  ~UnixSocketListener() override;

  // Why the messaging thread could not be woken: the system had no descriptors. Then resume() is not called.
  std::error_code problem() const { return problem_; }

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
  struct Entry {
    std::unique_ptr<UnixConnection> connection;
    UserIntake* intake;
    // What has happened since the connection was last served.
    std::uint32_t events = 0;
    bool isWoken = false;
    bool isQueued = false;
  };

  void handle(const Epoll::Event& event);
  void handleWakes();
  void queue(std::uint64_t identifier, std::uint32_t events, bool isWoken);
  // Serves connections that are queued, for about kRound.
  void serveQueued();
  void serve(std::uint64_t identifier);
  // Has the connections that wait for their users' room look again.
  void wakeWaiting();
  void accept();
  void recreateSocket();
  void add(FileDescriptor socket);
  UserIntake& intakeOf(const std::shared_ptr<Account>& account);
  void leave(UserIntake& intake);
  void pauseAccepting(const std::string& why);
  void resumeAccepting();
  // Adds the listening socket to the epoll. If that fails it pauses accepting, and so tries again later.
  void watchSocket();
  std::optional<std::chrono::milliseconds> timeToNextRound() const;
  // Removes a connection that has ended.
  void remove(std::uint64_t identifier);
  void endAll();

  std::unique_ptr<ServerSocket> socket_;
  const LogCategory& log_;
  MessagingListenerDelegate* delegate_ = nullptr;

  // Used by the messaging thread only.
  Epoll epoll_;
  const std::shared_ptr<IoWaker> waker_ = std::make_shared<IoWaker>();
  std::error_code problem_;
  Accounts& accounts_;
  std::vector<std::uint64_t> waiting_;  // connections whose users had no room
  std::optional<std::chrono::steady_clock::time_point> wakeWaitingAt_;
  const std::function<void()> beforeReplies_;
  const UnixConnectionContext context_;
  // Of the users that have connections.
  std::unordered_map<const Account*, std::unique_ptr<UserIntake>> intakes_;
  std::deque<UserIntake*> ready_;  // users with connections to be served, in the order of their turns
  const std::unique_ptr<WatchdogFeeder> watchdog_;  // null without a watchdog
  const std::size_t maxConnections_;
  std::unordered_map<std::uint64_t, Entry> connections_;
  std::uint64_t nextIdentifier_ = kWaker + 1;
  std::optional<std::chrono::steady_clock::time_point> acceptAgainAt_;  // set while accepting is paused
  bool hasLoggedPause_ = false;

  Mutex lifeMutex_;  // held by resume() and shutDown()
  std::atomic<bool> isStopping_ = false;
  std::atomic<bool> mustRestore_ = false;
  std::thread thread_ GUARDED_BY(lifeMutex_);
};

}  // namespace tonewerk
