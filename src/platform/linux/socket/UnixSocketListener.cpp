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
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/messagepack/RpcFrameDecoder.h"
#include "platform/linux/threads/BatchScope.h"

namespace tonewerk {
namespace {

// The most connections accepted in one round, so that existing connections are served in between.
constexpr int kMaxAcceptsAtOnce = 16;

// After this time it looks which further connections are ready, because they may be another user's.
constexpr std::chrono::milliseconds kRound{1};

std::size_t descriptorsForClients() {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur == RLIM_INFINITY) return SIZE_MAX;
  const auto all = static_cast<std::size_t>(limit.rlim_cur);
  return all - std::min(all / 2, UnixSocketListener::kReservedDescriptors);
}

}  // namespace

UnixSocketListener::UnixSocketListener(std::unique_ptr<ServerSocket> socket, const LogCategory& log,
                                       Accounts& accounts, std::unique_ptr<WatchdogFeeder> watchdog,
                                       AllocatorReclaimer* memory, std::function<void()> beforeReplies)
    : socket_(std::move(socket)),
      log_(log),
      accounts_(accounts),
      beforeReplies_(std::move(beforeReplies)),
      context_{epoll_, waker_, std::make_shared<RpcFrameDecoder>(), log_, memory, waiting_, beforeReplies_},
      watchdog_(std::move(watchdog)),
      maxConnections_(descriptorsForClients()) {
  accounts_.totals().setTotal(Resource::kConnections, maxConnections_);
  problem_ = epoll_.problem() ? epoll_.problem() : waker_->problem();
  if (!problem_ && !epoll_.add(waker_->fileDescriptor(), kWaker, EPOLLIN | EPOLLET)) {
    problem_ = {errno, std::generic_category()};
  }
}

UnixSocketListener::~UnixSocketListener() { shutDown(); }

void UnixSocketListener::resume() {
  const MutexLock lock(lifeMutex_);
  assert(delegate_ != nullptr && !problem_);
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
  watchSocket();
  infoLog(log_, "listening at %@", socket_->name());
  while (!isStopping_) {
    const BatchScope round;
    const auto timeout = ready_.empty() ? timeToNextRound() : std::chrono::milliseconds::zero();
    for (const Epoll::Event& event : epoll_.wait(timeout)) handle(event);
    if (wakeWaitingAt_ && std::chrono::steady_clock::now() >= *wakeWaitingAt_) wakeWaiting();
    serveQueued();
    if (!waiting_.empty() && !wakeWaitingAt_) wakeWaitingAt_ = std::chrono::steady_clock::now() + kRoomPause;
    if (acceptAgainAt_ && std::chrono::steady_clock::now() >= *acceptAgainAt_) resumeAccepting();
    if (watchdog_ != nullptr) watchdog_->pingIfDue();
  }
  endAll();
}

void UnixSocketListener::handle(const Epoll::Event& event) {
  if (event.identifier == kSocket) return accept();
  if (event.identifier == kWaker) return handleWakes();
  queue(event.identifier, event.events, false);
}

void UnixSocketListener::handleWakes() {
  for (const std::uint64_t identifier : waker_->take()) queue(identifier, 0, true);
  if (mustRestore_.exchange(false)) recreateSocket();
}

void UnixSocketListener::queue(std::uint64_t identifier, std::uint32_t events, bool isWoken) {
  const auto found = connections_.find(identifier);
  if (found == connections_.end()) return;  // it has ended
  Entry& entry = found->second;
  entry.events |= events;
  entry.isWoken |= isWoken;
  if (std::exchange(entry.isQueued, true)) return;
  if (entry.intake->ready.empty()) ready_.push_back(entry.intake);
  entry.intake->ready.push_back(identifier);
}

void UnixSocketListener::serveQueued() {
  std::optional<std::chrono::steady_clock::time_point> end;
  while (!ready_.empty()) {
    UserIntake& user = *ready_.front();
    ready_.pop_front();
    const std::uint64_t identifier = user.ready.front();
    user.ready.pop_front();
    if (!user.ready.empty()) ready_.push_back(&user);
    serve(identifier);
    if (ready_.empty()) return;
    const auto now = std::chrono::steady_clock::now();
    if (!end) end = now + kRound;
    if (now >= *end) return;
  }
}

void UnixSocketListener::wakeWaiting() {
  wakeWaitingAt_.reset();
  for (const std::uint64_t identifier : std::exchange(waiting_, {})) queue(identifier, 0, true);
}

void UnixSocketListener::serve(std::uint64_t identifier) {
  const auto found = connections_.find(identifier);
  if (found == connections_.end()) return;
  Entry& entry = found->second;
  entry.isQueued = false;
  const std::uint32_t events = std::exchange(entry.events, 0);
  const bool isWoken = std::exchange(entry.isWoken, false);
  const std::shared_ptr<Account> account = entry.intake->account;  // the intake may go with the connection
  const WorkingFor scope(account);
  if (events != 0) {
    entry.connection->handleEvents(events);
  } else if (isWoken) {
    entry.connection->handleWake();
  }
  if (entry.connection->hasEnded()) remove(identifier);
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
  const UnixPeer peer = UnixPeer::of(socket);
  const std::shared_ptr<Account> account = accounts_.of(peer.user);
  const WorkingFor scope(account);
  if (account->user() != peer.user) {
    errorLog(log_, "too many users: process %i of user %u is turned away", peer.process, peer.user);
    return;
  }
  if (!account->take(Resource::kConnections, 1)) {
    errorLog(log_, "user %u has %lu connections and gets no more: process %i is turned away", peer.user,
             account->held(Resource::kConnections), peer.process);
    return;
  }
  UserIntake& intake = intakeOf(account);
  const std::uint64_t identifier = nextIdentifier_++;
  auto connection = std::make_unique<UnixConnection>(context_, intake, identifier, std::move(socket), peer);
  infoLog(log_, "new %@", *connection);
  if (!delegate_->listenerShouldAcceptNewConnection(*connection)) {
    infoLog(log_, "%@ was turned away", *connection);
    connection = nullptr;
    return leave(intake);
  }
  connections_.emplace(identifier, Entry{std::move(connection), &intake});
}

UserIntake& UnixSocketListener::intakeOf(const std::shared_ptr<Account>& account) {
  std::unique_ptr<UserIntake>& intake = intakes_[account.get()];
  if (intake == nullptr) intake = std::make_unique<UserIntake>(account);
  ++intake->connections;
  return *intake;
}

void UnixSocketListener::leave(UserIntake& intake) {
  intake.account->give(Resource::kConnections, 1);
  if (--intake.connections > 0) return;
  std::erase(ready_, &intake);
  intakes_.erase(intake.account.get());
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

std::optional<std::chrono::milliseconds> UnixSocketListener::timeToNextRound() const {
  std::optional<std::chrono::milliseconds> next;
  const auto consider = [&next](std::chrono::milliseconds time) {
    next = next ? std::min(*next, time) : time;
  };
  for (const auto& due : {acceptAgainAt_, wakeWaitingAt_}) {
    if (!due) continue;
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(*due - std::chrono::steady_clock::now());
    consider(std::max(left, std::chrono::milliseconds::zero()));
  }
  if (watchdog_ != nullptr) consider(watchdog_->timeToNext());
  return next;
}

void UnixSocketListener::remove(std::uint64_t identifier) {
  const auto found = connections_.find(identifier);
  UserIntake& intake = *found->second.intake;
  connections_.erase(found);
  leave(intake);
  if (acceptAgainAt_) resumeAccepting();
}

void UnixSocketListener::endAll() {
  socket_ = nullptr;
  acceptAgainAt_.reset();
  for (const auto& [identifier, entry] : connections_) {
    const WorkingFor scope(entry.intake->account);
    entry.connection->end();
  }
  while (!connections_.empty()) remove(connections_.begin()->first);
}

}  // namespace tonewerk
