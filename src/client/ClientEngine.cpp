// SPDX-License-Identifier: Apache-2.0
#include "client/ClientEngine.h"

#include <algorithm>
#include <array>
#include <cassert>
#include <cerrno>
#include <limits>
#include <new>
#include <poll.h>
#include <random>
#include <unistd.h>

#include "client/ClientRegistry.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

constexpr const char* kThreadName = "tw-reporting";
constexpr std::size_t kReadBytes = std::size_t{16} * 1024;
// How many reads or writes the thread makes in a row before it turns to the other direction.
constexpr int kMaxTransfers = 16;

std::uint32_t seed() {
  const auto now = static_cast<std::uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
  return static_cast<std::uint32_t>(now ^ (now >> 32U) ^ static_cast<std::uint64_t>(::getpid()));
}

// Releases a mutex that the caller holds, until the scope ends.
class SCOPED_CAPABILITY MutexUnlock {
 public:
  explicit MutexUnlock(Mutex& mutex) RELEASE(mutex) : mutex_(mutex) { mutex_.unlock(); }
  MutexUnlock(const MutexUnlock&) = delete;
  MutexUnlock& operator=(const MutexUnlock&) = delete;
  ~MutexUnlock() RELEASE() { mutex_.lock(); }

 private:
  Mutex& mutex_;
};

}  // namespace

ClientEngine::ClientEngine(ClientSettings settings)
    : settings_(std::move(settings)),
      outbox_(settings_.queueBytes, deliveries_),
      backoff_(settings_.firstDelay, settings_.maxDelay, seed()),
      ringPoll_(settings_.busyPoll) {}

// ---- callers ----

bool ClientEngine::ensureRunning() {
  if (isEnding_) return true;
  if (thread_.isRunning()) {
    // The thread has nothing to do while there is no daemon, or while the daemon does not read.
    if (state_ == TWR_STATE_CONNECTED && !awaitsRoom_) wake();
    return true;
  }
  if (!event_.open() || !thread_.start(kThreadName, runThread, this)) return false;
  setState(TWR_STATE_CONNECTING);
  return true;
}

void ClientEngine::wake() {
  if (!isSleeping_ || isWoken_) return;
  isWoken_ = true;
  event_.signal();
}

twr_status ClientEngine::connect(milliseconds timeout) {
  if (ClientThread::isCurrent()) return TWR_WOULD_WAIT;
  if (hasForked_) return TWR_FORKED;
  MutexLock lock(mutex_);
  if (state_ == TWR_STATE_CONNECTED) return TWR_OK;
  if (state_ == TWR_STATE_ENDED) return TWR_NOT_CONNECTED;
  const auto waiter = std::make_shared<Waiter>();
  connectWaiters_.push_back(waiter);
  return await(lock, waiter, timeout);
}

twr_status ClientEngine::flush(milliseconds timeout) {
  if (ClientThread::isCurrent()) return TWR_WOULD_WAIT;
  if (hasForked_) return TWR_FORKED;
  MutexLock lock(mutex_);
  if (outbox_.isEmpty()) return TWR_OK;
  if (state_ == TWR_STATE_ENDED) return TWR_NOT_CONNECTED;
  const auto waiter = std::make_shared<Waiter>();
  outbox_.addBarrier(waiter);
  return await(lock, waiter, timeout);
}

twr_status ClientEngine::await(MutexLock& lock, const std::shared_ptr<Waiter>& waiter, milliseconds timeout) {
  // A caller waits, so the next attempt is made at once.
  nextAttempt_ = Clock::now();
  if (!ensureRunning()) return TWR_NO_MEMORY;
  wake();
  const auto until = Clock::now() + std::max(timeout, milliseconds::zero());
  while (!waiter->isDone && waiter->condition.waitUntil(lock, until)) {
  }
  if (waiter->isDone) return waiter->status;
  outbox_.removeBarrier(*waiter);
  std::erase(connectWaiters_, waiter);
  return TWR_TIMED_OUT;
}

void ClientEngine::end(milliseconds timeout) {
  MutexLock lock(mutex_);
  beginToEnd(timeout);
  joinThread(lock);
}

bool ClientEngine::endByItself(milliseconds timeout) {
  const MutexLock lock(mutex_);
  if (!thread_.isThisThread()) return false;
  isDetached_ = true;
  beginToEnd(timeout);
  return true;
}

void ClientEngine::beginToEnd(milliseconds timeout) {
  isEnding_ = true;
  endBy_ = Clock::now() + std::max(timeout, milliseconds::zero());
  nextAttempt_ = Clock::now();
  wake();
}

// The library may be unloaded while another thread destroys the client: one of the two joins, the other
// waits.
void ClientEngine::joinThread(MutexLock& lock) {
  if (!thread_.isRunning()) return;
  if (isBeingJoined_) {
    while (thread_.isRunning()) joined_.wait(lock);
    return;
  }
  isBeingJoined_ = true;
  const ClientThread thread = thread_;
  {
    const MutexUnlock unlocked(mutex_);
    thread.join();
  }
  thread_.forget();
  joined_.notifyAll();
}

twr_client_info ClientEngine::info() const {
  const MutexLock lock(mutex_);
  twr_client_info info{};
  info.size = sizeof(info);
  info.state = state_;
  info.last_error = lastError_;
  socketPath_.copy(info.socket_path, sizeof(info.socket_path) - 1);
  info.connections = connections_;
  info.messages_sent = outbox_.messagesSent();
  info.messages_dropped = outbox_.messagesDropped();
  info.queued_bytes = outbox_.queuedBytes();
  return info;
}

// ---- for the registry ----

void ClientEngine::afterForkInChild() {
  becomeForked();
  mutex_.unlock();
}

void ClientEngine::becomeForked() {
  hasForked_ = true;
  state_ = TWR_STATE_ENDED;
  ClientThread::becomeForked();
  socket_.close();
  event_.close();
  thread_.forget();
}

bool ClientEngine::hasThread() const {
  const MutexLock lock(mutex_);
  return thread_.isRunning() && !thread_.isThisThread();
}

bool ClientEngine::isReapable() const {
  const MutexLock lock(mutex_);
  return isDetached_ && hasFinished_;
}

void ClientEngine::abandon() {
  {
    const MutexLock lock(mutex_);
    isAbandoned_ = true;
  }
  end(milliseconds::zero());
  const MutexLock lock(mutex_);
  event_.close();
}

// ---- the thread ----

void ClientEngine::runThread(void* self) { static_cast<ClientEngine*>(self)->run(); }

void ClientEngine::run() {
  // A callback may fork, and the child may destroy the client there. Then this is the last reference.
  const std::shared_ptr<void> alive = owner;
  const MutexLock lock(mutex_);
  nextAttempt_ = Clock::now();
  while (!isDone()) {
    try {
      work();
    } catch (const std::bad_alloc&) {
      connectionLost(ENOMEM);
    }
    if (deliver()) {
      if (hasForked_) return;  // a callback has forked, and this is the child process
      continue;
    }
    if (!isDone()) sleep();
  }
  finish();
  hasFinished_ = !hasForked_;
}

void ClientEngine::work() {
  assert(thread_.isThisThread());
  if (state_ == TWR_STATE_ENDED) return;
  if (!socket_.isOpen() && Clock::now() >= nextAttempt_) attempt();
  if (!socket_.isOpen()) return;
  if (isReadable_) receive();
  if (socket_.isOpen() && !hasEndedSending_) transmit();
}

bool ClientEngine::isDone() const {
  if (!isEnding_) return false;
  if (isAbandoned_ || foundNoDaemon_ || state_ == TWR_STATE_ENDED || Clock::now() >= endBy_) return true;
  return !socket_.isOpen() && outbox_.isEmpty();
}

void ClientEngine::finish() {
  assert(thread_.isThisThread());
  const bool isLetGo = socket_.isOpen();
  socket_.close();
  if (isAbandoned_) {
    setState(TWR_STATE_ENDED);
    deliveries_.clear();
    return;
  }
  outbox_.end(isLetGo ? TWR_DESTROYED : whyUnanswered());
  state_ = TWR_STATE_ENDED;
  for (const std::shared_ptr<Waiter>& waiter : std::exchange(connectWaiters_, {}))
    waiter->finish(TWR_NOT_CONNECTED);
  while (deliver()) {
    if (hasForked_) return;
  }
}

void ClientEngine::attempt() {
  setState(TWR_STATE_CONNECTING);
  // If a path has a socket that cannot be used, report the error of the first such path. It says more than
  // that the last path has no socket.
  int problem = ENOENT;
  for (const std::string& path : settings_.socketPaths) {
    const int error = connectTo(path);
    if (error == 0) return connected(path);
    if (problem == ENOENT) problem = error;
  }
  attemptFailed(problem);
}

// The descriptor is in the member during the whole attempt, so that a forked child closes its copy.
int ClientEngine::connectTo(const std::string& path) {
  int error = socket_.open();
  if (error != 0) return error;
  {
    const MutexUnlock unlocked(mutex_);
    error = socket_.connect(path);
  }
  if (error != 0) socket_.close();
  return error;
}

void ClientEngine::connected(const std::string& path) {
  reader_.emplace(texts_);
  socketPath_ = path;
  ++connections_;
  connectedAt_ = Clock::now();
  isReadable_ = false;
  awaitsRoom_ = false;
  hasEndedSending_ = false;
  hasAnswered_ = false;
  outbox_.connected();
  setState(TWR_STATE_CONNECTED);
  for (const std::shared_ptr<Waiter>& waiter : std::exchange(connectWaiters_, {})) waiter->finish(TWR_OK);
}

void ClientEngine::attemptFailed(int error) {
  foundNoDaemon_ = isEnding_;
  waitBeforeNextAttempt(error);
  for (const std::shared_ptr<Waiter>& waiter : std::exchange(connectWaiters_, {}))
    waiter->finish(TWR_NOT_CONNECTED);
  outbox_.failBarriers(TWR_NOT_CONNECTED);
}

void ClientEngine::connectionLost(int error) {
  socket_.close();
  isReadable_ = false;
  awaitsRoom_ = false;
  outbox_.disconnected(whyUnanswered());
  if (hasAnswered_ || Clock::now() - connectedAt_ >= settings_.settledTime) backoff_.reset();
  waitBeforeNextAttempt(error);
}

void ClientEngine::waitBeforeNextAttempt(int error) {
  lastError_ = error;
  if (settings_.isOnce) {
    outbox_.end(whyUnanswered());
    setState(TWR_STATE_ENDED);
    return;
  }
  nextAttempt_ = Clock::now() + backoff_.next();
  if (isEnding_) {
    state_ = TWR_STATE_WAITING;  // only for a short time, so state_changed is not called
  } else {
    setState(TWR_STATE_WAITING);
  }
}

void ClientEngine::transmit() {
  for (int at = 0; at < kMaxTransfers; ++at) {
    const std::string_view bytes = outbox_.unsent();
    if (bytes.empty()) {
      outbox_.sent(0);
      if (!isEnding_ || !outbox_.isEmpty()) return;
      // The daemon answers no requests after the end of sending, and an answer's callback may make another
      // request.
      if (outbox_.awaitsAnswers() || !deliveries_.empty()) return;
      hasEndedSending_ = true;
      socket_.endSending();
      return;
    }
    ClientSocket::Transfer transfer;
    {
      const MutexUnlock unlocked(mutex_);
      transfer = socket_.send(bytes);
    }
    awaitsRoom_ = transfer.error == EAGAIN;
    if (awaitsRoom_) return;
    if (transfer.error != 0) return connectionLost(transfer.error);
    outbox_.sent(transfer.bytes);
  }
  isWoken_ = true;  // there may be more to send
}

void ClientEngine::receive() {
  std::array<char, kReadBytes> bytes;
  for (int at = 0; at < kMaxTransfers; ++at) {
    ClientSocket::Transfer transfer;
    {
      const MutexUnlock unlocked(mutex_);
      transfer = socket_.receive(bytes.data(), bytes.size());
    }
    isReadable_ = transfer.error != EAGAIN;
    if (!isReadable_) return;
    if (transfer.error != 0) return connectionLost(transfer.error);
    if (transfer.isEnd) return connectionLost(ECONNRESET);
    if (!decode({bytes.data(), transfer.bytes})) return connectionLost(EBADMSG);
  }
}

bool ClientEngine::decode(std::string_view bytes) {
  for (;;) {
    const RpcFrameReader::Result result = reader_->next(bytes);
    if (result != RpcFrameReader::Result::kFrame) return result == RpcFrameReader::Result::kNeedsMore;
    const RpcFrame& frame = reader_->frame();
    if (frame.kind != RpcFrame::Kind::kResponse || frame.refused) return false;
    hasAnswered_ = true;
    outbox_.answered(frame);
  }
}

bool ClientEngine::deliver() {
  if (deliveries_.empty()) return false;
  const Deliveries deliveries = std::exchange(deliveries_, {});
  const MutexUnlock unlocked(mutex_);
  for (const Delivery& delivery : deliveries) {
    if (delivery.state && isDetached_) continue;  // a callback before this one destroyed the client
    if (delivery.state) {
      settings_.stateChanged(settings_.context, *delivery.state);
    } else {
      delivery.reply.function(delivery.reply.context, &delivery.answer->as(delivery.reply.kind));
    }
    if (hasForked_) break;
  }
  return true;
}

void ClientEngine::sleep() {
  if (std::exchange(isWoken_, false)) return;
  const short events = awaitsRoom_ ? POLLIN | POLLOUT : POLLIN;
  std::array<pollfd, 2> polled{{{event_.fileDescriptor(), POLLIN, 0}, {socket_.fileDescriptor(), events, 0}}};
  const int timeout = pollTimeout();
  isSleeping_ = true;
  int count = 0;
  {
    const MutexUnlock unlocked(mutex_);
    count = ::poll(polled.data(), polled.size(), timeout);
  }
  isSleeping_ = false;
  isWoken_ = false;
  if (count <= 0) return;
  if (polled[0].revents != 0) event_.clear();
  isReadable_ = (polled[1].revents & ~POLLOUT) != 0;
  if ((polled[1].revents & POLLOUT) != 0) awaitsRoom_ = false;
}

// In milliseconds, rounded up; -1 to wait without a limit.
int ClientEngine::pollTimeout() {
  std::optional<Clock::time_point> until;
  const auto notAfter = [&](Clock::time_point time) { until = until ? std::min(*until, time) : time; };
  if (isEnding_) notAfter(endBy_);
  if (state_ == TWR_STATE_WAITING) notAfter(nextAttempt_);
  if (state_ == TWR_STATE_CONNECTED && outbox_.hasSenders() && !awaitsRoom_) {
    const bool isBusy = std::exchange(seenRingMessages_, outbox_.ringMessages()) != outbox_.ringMessages();
    ringPoll_ = isBusy ? settings_.busyPoll : std::min(2 * ringPoll_, settings_.idlePoll);
    notAfter(Clock::now() + ringPoll_);
  }
  if (!until) return -1;
  const auto left = std::chrono::ceil<milliseconds>(*until - Clock::now()).count();
  return static_cast<int>(std::clamp<std::int64_t>(left, 0, std::numeric_limits<int>::max()));
}

void ClientEngine::setState(twr_state state) {
  if (state_ == state) return;
  state_ = state;
  if (settings_.stateChanged != nullptr) deliveries_.push_back({{}, nullptr, state});
}

}  // namespace tonewerk
