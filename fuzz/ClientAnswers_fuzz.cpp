// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as the life of a client of the library: what its caller asks for, what is sent, connections
// that begin and end, and bytes from the daemon. Whatever the daemon answers, each accepted reply is called
// exactly once, and the members of its answer can be read.
#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "FuzzInput.h"
#include "client/ClientEngine.h"
#include "client/ClientOutbox.h"
#include "platform/linux/messagepack/RpcFrameReader.h"
#include "tonewerk/reporting.h"

namespace tonewerk {
namespace {

using Kind = SessionChange::Kind;

class Client {
 public:
  void run(FuzzInput& input) {
    while (!input.empty()) step(input);
    outbox_.end();
    deliver();
    for (const int calls : calls_) expect(calls == 1);
    expect(!outbox_.awaitsAnswers());
  }

 private:
  void step(FuzzInput& input) {
    switch (input.below(10)) {
      case 0:
        if (auto session = outbox_.addSession(engine_, input.byte())) sessions_.push_back(std::move(session));
        return;
      case 1:
        return change(input);
      case 2:
        if (sessions_.empty()) return;
        (void)ask(input, [&](PendingReply reply) { return outbox_.destroy(*sessions_.back(), reply); });
        return sessions_.pop_back();
      case 3:
        return (void)ask(input, [&](PendingReply reply) { return outbox_.request("\xA1m\x90", reply); });
      case 4:
        return send(input);
      case 5:
        return connect();
      case 6:
        outbox_.sent(std::min<std::size_t>(outbox_.unsent().size(), input.byte()));
        return;
      case 7:
        outbox_.sent(outbox_.unsent().size());
        return;
      case 8:
        return receive(input.shortText());
      default:
        return disconnect();
    }
  }

  void change(FuzzInput& input) {
    if (sessions_.empty()) return;
    twr_session& session = *sessions_[input.below(sessions_.size())];
    static constexpr std::array kKinds = {Kind::kServiceType, Kind::kConfiguration, Kind::kStart,
                                          Kind::kStop};
    SessionChange change{kKinds[input.below(kKinds.size())], input.byte(), {}};
    if (change.kind == Kind::kConfiguration) change.configuration.set("key", input.byte());
    const bool isStart = change.kind == Kind::kStart;
    (void)ask(input, [&](PendingReply reply) {
      reply.isStart = isStart;
      return outbox_.change(session, std::move(change), reply);
    });
  }

  void send(FuzzInput& input) {
    twr_session* session = sessions_.empty() ? nullptr : sessions_[input.below(sessions_.size())].get();
    const std::string value = "\xA1n" + std::string(1, static_cast<char>(input.byte() & 0x7F));
    const RingMessage message{4, 1, 1.0,
                              0, 1, {reinterpret_cast<const unsigned char*>(value.data()), value.size()}};
    const std::array<std::int64_t, 1> identifiers = {session != nullptr ? session->identifier : 7};
    (void)ask(input, [&](PendingReply reply) { return outbox_.send(session, message, identifiers, reply); });
  }

  // Calls `ask` with a reply, or without one. Accepted replies must be called.
  template <typename Ask>
  twr_status ask(FuzzInput& input, Ask ask) {
    const std::size_t choice = input.below(5);
    if (choice == 4) return ask(PendingReply{});
    calls_.push_back(0);
    void* place = reinterpret_cast<void*>(calls_.size() - 1);
    const PendingReply reply{[](void*, const twr_answer*) {}, place, static_cast<AnswerKind>(choice)};
    const twr_status status = ask(reply);
    if (status != TWR_OK) calls_.pop_back();
    return status;
  }

  void connect() {
    if (std::exchange(isConnected_, true)) return;
    reader_.emplace(texts_);
    outbox_.connected();
  }
  void disconnect() {
    if (!std::exchange(isConnected_, false)) return;
    outbox_.disconnected();
    deliver();
  }

  // Does what the client's engine does with bytes from the daemon.
  void receive(std::string_view bytes) {
    if (!isConnected_) return;
    for (;;) {
      const RpcFrameReader::Result result = reader_->next(bytes);
      if (result == RpcFrameReader::Result::kNeedsMore) return;
      if (result == RpcFrameReader::Result::kBroken) return disconnect();
      const RpcFrame& frame = reader_->frame();
      if (frame.kind != RpcFrame::Kind::kResponse || frame.refused) return disconnect();
      outbox_.answered(frame);
      deliver();
    }
  }

  void deliver() {
    for (const Delivery& delivery : std::exchange(deliveries_, {})) {
      ++calls_.at(reinterpret_cast<std::size_t>(delivery.reply.context));
      const twr_answer& answer = delivery.answer->as(delivery.reply.kind);
      expect(answer.error_domain != nullptr && answer.error_message != nullptr);
      expect(answer.status == TWR_REFUSED || answer.error_domain[0] == '\0');
      expect((answer.result == nullptr) == (answer.result_size == 0));
      std::int64_t sum = 0;
      for (std::size_t at = 0; at < answer.reporter_id_count; ++at) sum ^= answer.reporter_ids[at];
      (void)sum;
    }
  }

  ClientEngine engine_{ClientSettings{}};
  Deliveries deliveries_;
  ClientOutbox outbox_{ClientSettings::kDefaultQueueBytes, deliveries_};
  std::vector<std::shared_ptr<twr_session>> sessions_;
  std::vector<int> calls_;  // of each accepted reply
  RpcStrings texts_;
  std::optional<RpcFrameReader> reader_;
  bool isConnected_ = false;
};

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  tonewerk::FuzzInput input(data, size);
  tonewerk::Client().run(input);
  return 0;
}
