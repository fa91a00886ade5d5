// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryMessaging.h"

#include <algorithm>
#include <functional>
#include <string>
#include <utility>

#include "values/Mutex.h"

namespace tonewerk {

// Implements both ends of the connection. The client, the listener's delegate and pending replies share it.
class MemoryClient::Connection final : public MessagingConnection,
                                       public ReplySink,
                                       public InFlightCounter,
                                       public std::enable_shared_from_this<Connection> {
 public:
  Connection(std::int32_t processIdentifier, std::shared_ptr<Account> account)
      : processIdentifier_(processIdentifier), account_(std::move(account)) {}

  std::int32_t processIdentifier() const override { return processIdentifier_; }
  std::uint32_t userIdentifier() const override { return account_->user(); }
  const std::shared_ptr<Account>& account() const override { return account_; }
  std::string description() const override {
    return "memory connection of " + std::to_string(processIdentifier_);
  }
  void setRequestHandler(const RequestSet& requests, std::shared_ptr<RequestHandler> handler) override {
    requests_ = &requests;
    handler_ = std::move(handler);
  }
  void setInterruptionHandler(std::function<void()> handler) override { interrupted_ = std::move(handler); }
  void setInvalidationHandler(std::function<void()> handler) override { invalidated_ = std::move(handler); }

  void resume() override {
    isResumed_ = true;
    std::vector<Waiting> waiting = std::exchange(waiting_, {});
    for (Waiting& request : waiting) receive(std::move(request));
  }

  void receive(std::string_view method, Arguments arguments, std::optional<std::uint32_t> identifier) {
    receive(Waiting{std::string(method), std::move(arguments), identifier});
  }

  void end() {
    if (hasEnded()) return;
    {
      const MutexLock lock(mutex_);
      hasEnded_ = true;
    }
    if (interrupted_) interrupted_();
    if (invalidated_) invalidated_();
    interrupted_ = nullptr;
    invalidated_ = nullptr;
    handler_ = nullptr;
  }

  void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
             const std::optional<Value>& result) override {
    const MutexLock lock(mutex_);
    if (hasEnded_) return;
    responses_.push_back({requestIdentifier, error, error ? std::nullopt : result});
    changed_.notifyAll();
  }

  void finished(std::size_t) override {
    const MutexLock lock(mutex_);
    --unfinished_;
  }

  bool hasEnded() const {
    const MutexLock lock(mutex_);
    return hasEnded_;
  }
  std::vector<MemoryResponse> responses() const {
    const MutexLock lock(mutex_);
    return responses_;
  }
  bool waitForResponses(std::size_t count, std::chrono::milliseconds timeout) const {
    const auto end = std::chrono::steady_clock::now() + timeout;
    MutexLock lock(mutex_);
    while (responses_.size() < count && changed_.waitUntil(lock, end)) {
    }
    return responses_.size() >= count;
  }
  std::size_t unfinished() const {
    const MutexLock lock(mutex_);
    return unfinished_;
  }

 private:
  struct Waiting {
    std::string method;
    Arguments arguments;
    std::optional<std::uint32_t> identifier;
  };

  void receive(Waiting request) {
    if (hasEnded() || handler_ == nullptr) return;
    if (!isResumed_) {
      waiting_.push_back(std::move(request));
      return;
    }
    const Reply reply = request.identifier ? Reply(shared_from_this(), *request.identifier) : Reply();
    const std::optional<std::size_t> place = requests_->find(request.method);
    if (!place) return reply(messagingError(kUnknownMethod, "unknown method " + request.method));
    const Method& method = requests_->methods[*place];
    if (const auto problem = problemWithCaller(method, account_->isTrusted())) {
      return reply(problem);
    }
    if (const auto problem = problemWith(method, request.arguments)) {
      return reply(messagingError(kInvalidArguments, *problem));
    }
    {
      const MutexLock lock(mutex_);
      ++unfinished_;
    }
    // Also kept here, because the request itself may end the connection.
    const std::shared_ptr<RequestHandler> handler = handler_;
    handler->handleRequest(*place, std::move(request.arguments), reply, InFlightToken(shared_from_this(), 0));
  }

  const std::int32_t processIdentifier_;
  const std::shared_ptr<Account> account_;
  const RequestSet* requests_ = nullptr;
  std::shared_ptr<RequestHandler> handler_;
  std::function<void()> interrupted_;
  std::function<void()> invalidated_;
  bool isResumed_ = false;
  std::vector<Waiting> waiting_;  // sent before the delegate resumed the connection

  mutable Mutex mutex_;
  mutable Condition changed_;
  bool hasEnded_ GUARDED_BY(mutex_) = false;
  std::vector<MemoryResponse> responses_ GUARDED_BY(mutex_);
  std::size_t unfinished_ GUARDED_BY(mutex_) = 0;
};

MemoryClient::MemoryClient(std::shared_ptr<Connection> connection) : connection_(std::move(connection)) {}

MemoryClient::~MemoryClient() { disconnect(); }

std::uint32_t MemoryClient::request(std::string_view method, Arguments arguments) {
  const std::uint32_t identifier = nextIdentifier_++;
  connection_->receive(method, std::move(arguments), identifier);
  return identifier;
}

void MemoryClient::notify(std::string_view method, Arguments arguments) {
  connection_->receive(method, std::move(arguments), std::nullopt);
}

void MemoryClient::disconnect() { connection_->end(); }

bool MemoryClient::hasEnded() const { return connection_->hasEnded(); }

std::vector<MemoryResponse> MemoryClient::responses() const { return connection_->responses(); }

std::optional<MemoryResponse> MemoryClient::responseTo(std::uint32_t identifier) const {
  const std::vector<MemoryResponse> all = responses();
  const auto found = std::find_if(all.begin(), all.end(), [&](const MemoryResponse& response) {
    return response.identifier == identifier;
  });
  return found == all.end() ? std::nullopt : std::optional(*found);
}

bool MemoryClient::waitForResponses(std::size_t count, std::chrono::milliseconds timeout) const {
  return connection_->waitForResponses(count, timeout);
}

std::size_t MemoryClient::unfinishedRequests() const { return connection_->unfinished(); }

MemoryMessaging::MemoryMessaging(Accounts* accounts)
    : accounts_(accounts != nullptr ? *accounts : own_.emplace(kOwner, clock_)) {}

MemoryMessaging::~MemoryMessaging() { shutDown(); }

void MemoryMessaging::shutDown() {
  isAccepting_ = false;
  for (const auto& held : std::exchange(connections_, {})) {
    if (const auto connection = held.lock()) connection->end();
  }
}

std::unique_ptr<MemoryClient> MemoryMessaging::connect(std::int32_t processIdentifier,
                                                       std::uint32_t userIdentifier) {
  if (!isAccepting_ || delegate_ == nullptr) return nullptr;
  auto connection =
      std::make_shared<MemoryClient::Connection>(processIdentifier, accounts_.of(userIdentifier));
  if (!delegate_->listenerShouldAcceptNewConnection(*connection)) return nullptr;
  std::erase_if(connections_, [](const auto& held) { return held.expired(); });
  connections_.push_back(connection);
  return std::unique_ptr<MemoryClient>(new MemoryClient(std::move(connection)));
}

}  // namespace tonewerk
