// SPDX-License-Identifier: Apache-2.0
#include "tools/offline/OfflineConnections.h"

#include <algorithm>
#include <string>
#include <utility>
#include <vector>

#include "platform/accounts/Account.h"
#include "platform/accounts/WorkingFor.h"

namespace tonewerk {

class OfflineConnections::Connection final : public MessagingConnection,
                                             public ReplySink,
                                             public std::enable_shared_from_this<Connection> {
 public:
  Connection(std::uint64_t number, std::int32_t process, std::shared_ptr<Account> account,
             const Refusal& refusal)
      : number_(number), process_(process), account_(std::move(account)), refusal_(refusal) {}

  std::int32_t processIdentifier() const override { return process_; }
  std::uint32_t userIdentifier() const override { return account_->user(); }
  const std::shared_ptr<Account>& account() const override { return account_; }
  std::string description() const override { return "recorded client, process " + std::to_string(process_); }
  void setRequestHandler(const RequestSet& requests, std::shared_ptr<RequestHandler> handler) override {
    requests_ = &requests;
    handler_ = std::move(handler);
  }
  void setInterruptionHandler(std::function<void()> handler) override { interrupted_ = std::move(handler); }
  void setInvalidationHandler(std::function<void()> handler) override { invalidated_ = std::move(handler); }
  void resume() override {}

  // In the order of the listeners: who the caller is comes after whether the method exists. The reader of the
  // recording has checked method and arguments.
  void send(const RecordedStep& call, double now) {
    calls_.push_back(&call);
    const Reply reply(shared_from_this(), static_cast<std::uint32_t>(calls_.size() - 1));
    const std::size_t place = requests_->find(call.method).value_or(0);
    if (const auto problem = problemWithCaller(requests_->methods[place], account_->isTrusted())) {
      return reply(problem);
    }
    handler_->isUrgent(place);
    handler_->handleRequest(place, call.parametersAt(now), reply, InFlightToken());
  }

  void end() {
    hasEnded_ = true;
    const WorkingFor scope(account_);
    interrupted_();
    invalidated_();
    drop();
  }

  // Its handler refers to sessions, and these to the replies of this connection.
  void drop() {
    hasEnded_ = true;
    interrupted_ = nullptr;
    invalidated_ = nullptr;
    handler_ = nullptr;
  }

  void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
             const std::optional<Value>& /*result*/) override {
    if (error && !hasEnded_) refusal_(*calls_[requestIdentifier], *error);
  }

  std::uint64_t number() const { return number_; }

 private:
  const std::uint64_t number_;
  const std::int32_t process_;
  const std::shared_ptr<Account> account_;
  const Refusal& refusal_;
  const RequestSet* requests_ = nullptr;
  std::shared_ptr<RequestHandler> handler_;
  std::function<void()> interrupted_;
  std::function<void()> invalidated_;
  std::vector<const RecordedStep*> calls_;  // by the identifier of their request
  bool hasEnded_ = false;
};

OfflineConnections::OfflineConnections(MessagingListenerDelegate& delegate, Refusal refusal)
    : delegate_(delegate), refusal_(std::move(refusal)) {}

OfflineConnections::~OfflineConnections() {
  for (const auto& [client, connection] : connections_) connection->drop();
}

void OfflineConnections::connect(std::int64_t client, std::int32_t process,
                                 std::shared_ptr<Account> account) {
  auto connection = std::make_shared<Connection>(++connected_, process, std::move(account), refusal_);
  // The service accepts every connection.
  (void)delegate_.listenerShouldAcceptNewConnection(*connection);
  connections_[client] = std::move(connection);
}

void OfflineConnections::send(const RecordedStep& call, double now) {
  connections_.at(call.client)->send(call, now);
}

void OfflineConnections::disconnect(std::int64_t client) {
  const auto found = connections_.find(client);
  if (found == connections_.end()) return;
  const std::shared_ptr<Connection> connection = std::move(found->second);
  connections_.erase(found);
  connection->end();
}

std::optional<std::int64_t> OfflineConnections::first() const {
  const auto first =
      std::min_element(connections_.begin(), connections_.end(),
                       [](const auto& a, const auto& b) { return a.second->number() < b.second->number(); });
  return first == connections_.end() ? std::nullopt : std::optional(first->first);
}

}  // namespace tonewerk
