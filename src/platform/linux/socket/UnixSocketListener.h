// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <thread>
#include <unistd.h>
#include <unordered_map>
#include <vector>

#include "platform/Messaging.h"
#include "platform/linux/descriptors/Epoll.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/socket/ServerSocket.h"
#include "platform/linux/socket/UnixConnection.h"
#include "platform/linux/system/WatchdogFeeder.h"
#include "platform/linux/threads/IoWaker.h"
#include "values/Mutex.h"

namespace tonewerk {

// Serves clients over a Unix socket, all of them on one thread of its own, the messaging thread.
//
// Every round gives each connection that is ready one read, so that no client can keep the others waiting.
// Clients take only so many descriptors that kReservedDescriptors are left for the daemon's own files; who
// comes then waits in the socket's backlog.
class UnixSocketListener final : public MessagingListener {
 public:
  static constexpr std::size_t kReadBytes = std::size_t{64} * 1024;
  static constexpr std::size_t kReservedDescriptors = 64;
  // When the system has no descriptor for another client, the next try is after this time or a connection's
  // end.
  static constexpr std::chrono::milliseconds kAcceptPause{1000};

  // `log` outlives the listener. The messaging thread feeds `watchdog`; without one it wakes up for clients
  // alone. `owner` is the user who, beside root, may use what is for the daemon's own. `memory`, which
  // outlives the listener, is told of what clients bring, and of their ends.
  UnixSocketListener(std::unique_ptr<ServerSocket> socket, const LogCategory& log,
                     std::unique_ptr<WatchdogFeeder> watchdog = nullptr, std::uint32_t owner = ::geteuid(),
                     AllocatorReclaimer* memory = nullptr);
  ~UnixSocketListener() override;

  void setDelegate(MessagingListenerDelegate& delegate) override { delegate_ = &delegate; }
  void resume() override;
  void shutDown() override;

  // Any thread. Where the socket's file is gone, a new one is soon made in its place; connections live on.
  // What stands in the way is logged.
  void restoreSocket();

 private:
  // Numbers in the epoll; connections have those above.
  static constexpr std::uint64_t kSocket = 0;
  static constexpr std::uint64_t kWaker = 1;

  void run();
  void handle(const Epoll::Event& event);
  void handleWakes();
  void accept();
  void makeSocketAgain();
  void add(FileDescriptor socket);
  void pauseAccepting(const std::string& why);
  void resumeAccepting();
  // Puts the listening socket into the epoll. Pauses accepting, and so tries again later, when that fails.
  void watchSocket();
  std::optional<std::chrono::milliseconds> timeToNextAccept() const;
  std::optional<std::chrono::milliseconds> timeToNextRound() const;
  void removeIfEnded(std::uint64_t identifier);
  void endEverything();

  std::unique_ptr<ServerSocket> socket_;
  const LogCategory& log_;
  MessagingListenerDelegate* delegate_ = nullptr;

  // The messaging thread's.
  Epoll epoll_;
  const std::shared_ptr<IoWaker> waker_ = std::make_shared<IoWaker>();
  RpcStrings texts_;
  std::vector<char> readBuffer_;
  const UnixConnectionContext context_;
  const std::unique_ptr<WatchdogFeeder> watchdog_;  // none where nobody watches
  const std::size_t mostConnections_;
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
