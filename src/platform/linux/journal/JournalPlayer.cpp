// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/JournalPlayer.h"

#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/Heartbeat.h"
#include "platform/JournalProcess.h"
#include "platform/RequestHandler.h"
#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "platform/linux/messagepack/RpcFrameScanner.h"
#include "protocol/RequestSet.h"

namespace tonewerk {
namespace {

// The journal has no other requests. One that ends the process would end each start that plays it.
bool isPlayed(const Method& method) {
  return method.changesState && method.result.type != ResultType::kNever;
}

}  // namespace

// A client as it was. Its answers go nowhere.
class JournalPlayer::Connection final : public MessagingConnection {
 public:
  Connection(JournalProcess process, std::shared_ptr<Account> account)
      : process_(std::move(process)), account_(std::move(account)) {}

  std::int32_t processIdentifier() const override { return process_.identifier; }
  std::uint32_t userIdentifier() const override { return account_->user(); }
  const std::shared_ptr<Account>& account() const override { return account_; }
  std::optional<std::string> processName() const override { return process_.name; }
  std::string description() const override {
    return "connection of process " + std::to_string(process_.identifier) + ", played from the journal";
  }
  void setRequestHandler(const RequestSet& requests, std::shared_ptr<RequestHandler> handler) override {
    requests_ = &requests;
    handler_ = std::move(handler);
  }
  void setInterruptionHandler(std::function<void()> handler) override { interrupted_ = std::move(handler); }
  void setInvalidationHandler(std::function<void()> handler) override { invalidated_ = std::move(handler); }
  void resume() override {}

  void end() {
    if (interrupted_) interrupted_();
    if (invalidated_) invalidated_();
    handler_ = nullptr;
  }

  void handle(const RpcFrameScanner::Frame& scanned, std::string_view bytes, RpcFrameDecoder& decoder) const {
    if (handler_ == nullptr) return;
    const std::optional<std::size_t> method = requests_->find(scanned.method);
    if (!method) return;
    const Method& called = requests_->methods[*method];
    if (!isPlayed(called)) return;
    const WorkingFor scope(account_);
    ShapeTable* const shapes = handler_->shapes();
    if (shapes != nullptr && called.carriesMessage) {
      IncomingMessage* message =
          decoder.decodeMessage({bytes, scanned.argumentCount, scanned.arguments}, *shapes);
      if (message != nullptr) {
        handler_->beginFrame(bytes);
        handler_->handleMessage(*method, *message, Reply(), InFlightToken());
      }
      decoder.releaseMessage();
      if (message != nullptr) return;
    }
    RpcFrame& frame = decoder.decode(bytes);
    if (frame.refused || problemWith(called, frame.arguments)) return;  // the journal has no such requests
    if (shapes != nullptr) handler_->beginFrame(bytes);
    handler_->handleRequest(*method, std::move(frame.arguments), Reply(), InFlightToken());
  }

 private:
  const JournalProcess process_;
  const std::shared_ptr<Account> account_;
  const RequestSet* requests_ = nullptr;
  std::shared_ptr<RequestHandler> handler_;
  std::function<void()> interrupted_;
  std::function<void()> invalidated_;
};

JournalPlayer::JournalPlayer(Journal& journal, MessagingListenerDelegate& service, Accounts& accounts,
                             Hooks hooks)
    : journal_(journal), service_(service), accounts_(accounts), hooks_(std::move(hooks)) {}

JournalPlayer::~JournalPlayer() = default;

Journal::Reading JournalPlayer::play() {
  return journal_.read([this](const Journal::Record& record) {
    playRecord(record);
    hooks_.progress(++played_);
    Heartbeat::beatHere();
    return true;
  });
}

void JournalPlayer::playRecord(const Journal::Record& record) {
  time_.set(record.origin.at);
  switch (record.kind) {
    case Journal::Kind::kConnected:
      return connect(record);
    case Journal::Kind::kDisconnected:
      return disconnect(record);
    case Journal::Kind::kRequest:
      return request(record);
    case Journal::Kind::kSingleMessagesEnded:
      hooks_.begins(record);
      return hooks_.endSingleMessages(record.origin.user);
  }
}

// A client's number is that of its first record, which cannot know it.
void JournalPlayer::connect(const Journal::Record& record) {
  Journal::Record known = record;
  if (known.origin.client == 0) known.origin.client = record.sequence;
  hooks_.begins(known);
  if (connections_.contains(known.origin.client)) return;
  std::optional<JournalProcess> process = decodedJournalProcess(record.bytes);
  if (!process) return;
  auto connection = std::make_unique<Connection>(std::move(*process), accounts_.of(record.origin.user));
  if (!service_.listenerShouldAcceptNewConnection(*connection)) return;
  connections_.emplace(known.origin.client, std::move(connection));
}

void JournalPlayer::disconnect(const Journal::Record& record) {
  const auto found = connections_.find(record.origin.client);
  if (found == connections_.end()) return;
  hooks_.begins(record);
  found->second->end();
  connections_.erase(found);
}

void JournalPlayer::request(const Journal::Record& record) {
  const auto found = connections_.find(record.origin.client);
  if (found == connections_.end()) return;
  RpcFrameScanner scanner;
  if (scanner.scan(record.bytes) != RpcFrameScanner::Result::kFrame) return;
  hooks_.begins(record);
  found->second->handle(scanner.frame(), record.bytes, decoder_);
}

void JournalPlayer::endAll() {
  for (const auto& [number, connection] : connections_) {
    connection->end();
    hooks_.progress(played_);
    Heartbeat::beatHere();
  }
  connections_.clear();
}

}  // namespace tonewerk
