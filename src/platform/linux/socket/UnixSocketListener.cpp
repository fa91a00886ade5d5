// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/UnixSocketListener.h"

#include <algorithm>
#include <cassert>
#include <cerrno>
#include <pthread.h>
#include <string>
#include <sys/resource.h>
#include <sys/socket.h>
#include <system_error>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/messagepack/RpcFrameDecoder.h"
#include "platform/linux/threads/BatchScope.h"

namespace tonewerk {
namespace {

// The most connections accepted in one round, so that existing connections are served in between.
constexpr int kMaxAcceptsAtOnce = 16;

std::size_t descriptorsForClients() {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur == RLIM_INFINITY) return SIZE_MAX;
  const auto all = static_cast<std::size_t>(limit.rlim_cur);
  return all - std::min(all / 2, UnixSocketListener::kReservedDescriptors);
}

}  // namespace

UnixSocketListener::UnixSocketListener(std::unique_ptr<ServerSocket> socket, const LogCategory& log,
                                       Accounts& accounts, std::unique_ptr<WatchdogFeeder> watchdog,
                                       AllocatorReclaimer* memory)
    : socket_(std::move(socket)),
      log_(log),
      context_{epoll_, waker_, slabs_, std::make_shared<RpcFrameDecoder>(), log_, accounts, memory},
      watchdog_(std::move(watchdog)),
      maxConnections_(descriptorsForClients()) {}

UnixSocketListener::~UnixSocketListener() { shutDown(); }

void UnixSocketListener::resume() {
  const MutexLock lock(lifeMutex_);
  assert(delegate_ != nullptr);
  if (thread_.joinable() || isStopping_) return;
  thread_ = std::thread([this] { run(); });
}

void UnixSocketListener::shutDown() {
  const MutexLock lock(lifeMutex_);
  assert(std::this_thread::get_id() != thread_.get_id());
  isStopping_ = true;
  waker_->wake(kWaker);
  if (thread_.joinable()) thread_.join();
  socket_ = nullptr;
}

void UnixSocketListener::run() {
  ::pthread_setname_np(::pthread_self(), "tw-messaging");
  // Without the waker the thread would never notice that it has to stop.
  if (!epoll_.add(waker_->fileDescriptor(), kWaker, EPOLLIN | EPOLLET)) {
    errorLog(log_, "cannot be woken: %@", std::generic_category().message(errno));
  }
  watchSocket();
  infoLog(log_, "listening at %@", socket_->name());
  while (!isStopping_) {
    const BatchScope round;
    for (const Epoll::Event& event : epoll_.wait(timeToNextRound())) handle(event);
    if (acceptAgainAt_ && std::chrono::steady_clock::now() >= *acceptAgainAt_) resumeAccepting();
    if (watchdog_ != nullptr) watchdog_->pingIfDue();
  }
  endAll();
}

void UnixSocketListener::handle(const Epoll::Event& event) {
  if (event.identifier == kSocket) return accept();
  if (event.identifier == kWaker) return handleWakes();
  // A connection that ended earlier in this round is no longer in the map.
  const auto found = connections_.find(event.identifier);
  if (found == connections_.end()) return;
  found->second->handleEvents(event.events);
  removeIfEnded(event.identifier);
}

void UnixSocketListener::handleWakes() {
  for (const std::uint64_t identifier : waker_->take()) {
    const auto found = connections_.find(identifier);
    if (found == connections_.end()) continue;
    found->second->handleWake();
    removeIfEnded(identifier);
  }
  if (mustRestore_.exchange(false)) recreateSocket();
}

void UnixSocketListener::restoreSocket() {
  mustRestore_ = true;
  waker_->wake(kWaker);
}

void UnixSocketListener::recreateSocket() {
  if (socket_->isInPlace()) return;
  std::string problem;
  std::unique_ptr<ServerSocket> socket = socket_->recreate(problem);
  if (socket == nullptr) {
    errorLog(log_, "clients cannot connect: %@", problem);
    return;
  }
  if (!acceptAgainAt_) accept();  // clients that connected to the old socket
  const bool isPaused = acceptAgainAt_.has_value();
  if (!isPaused) epoll_.remove(socket_->fileDescriptor());
  socket_ = std::move(socket);
  if (!isPaused) watchSocket();
  defaultLog(log_, "%@ was gone and is made again", socket_->name());
}

void UnixSocketListener::accept() {
  for (int count = 0; count < kMaxAcceptsAtOnce; ++count) {
    if (connections_.size() >= maxConnections_) return pauseAccepting("too many clients");
    FileDescriptor socket(
        ::accept4(socket_->fileDescriptor(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
    if (socket) {
      add(std::move(socket));
      continue;
    }
    if (errno == EAGAIN) {
      hasLoggedPause_ = false;  // no client waits any more, so the next shortage is logged again
      return;
    }
    // A client that disconnected before its turn does not matter. Any other error would repeat at once.
    if (errno != EINTR && errno != ECONNABORTED)
      return pauseAccepting(std::generic_category().message(errno));
  }
}

void UnixSocketListener::add(FileDescriptor socket) {
  const std::uint64_t identifier = nextIdentifier_++;
  auto connection = std::make_unique<UnixConnection>(context_, identifier, std::move(socket));
  infoLog(log_, "new %@", *connection);
  if (!delegate_->listenerShouldAcceptNewConnection(*connection)) {
    infoLog(log_, "%@ was turned away", *connection);
    return;
  }
  connections_.emplace(identifier, std::move(connection));
}

void UnixSocketListener::pauseAccepting(const std::string& why) {
  if (!hasLoggedPause_) errorLog(log_, "cannot accept another client for now: %@", why);
  hasLoggedPause_ = true;
  epoll_.remove(socket_->fileDescriptor());
  acceptAgainAt_ = std::chrono::steady_clock::now() + kAcceptPause;
}

void UnixSocketListener::resumeAccepting() {
  acceptAgainAt_.reset();
  watchSocket();
}

void UnixSocketListener::watchSocket() {
  if (epoll_.add(socket_->fileDescriptor(), kSocket, EPOLLIN)) return;
  pauseAccepting(std::generic_category().message(errno));
}

std::optional<std::chrono::milliseconds> UnixSocketListener::timeToNextAccept() const {
  if (!acceptAgainAt_) return std::nullopt;
  const auto left =
      std::chrono::ceil<std::chrono::milliseconds>(*acceptAgainAt_ - std::chrono::steady_clock::now());
  return std::max(left, std::chrono::milliseconds::zero());
}

std::optional<std::chrono::milliseconds> UnixSocketListener::timeToNextRound() const {
  const auto accept = timeToNextAccept();
  if (watchdog_ == nullptr) return accept;
  return accept ? std::min(*accept, watchdog_->timeToNext()) : watchdog_->timeToNext();
}

void UnixSocketListener::removeIfEnded(std::uint64_t identifier) {
  const auto found = connections_.find(identifier);
  if (found == connections_.end() || !found->second->hasEnded()) return;
  connections_.erase(found);
  if (acceptAgainAt_) resumeAccepting();
}

void UnixSocketListener::endAll() {
  socket_ = nullptr;
  for (const auto& [identifier, connection] : connections_) connection->end();
  connections_.clear();
}

}  // namespace tonewerk
