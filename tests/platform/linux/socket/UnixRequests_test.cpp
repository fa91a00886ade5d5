// SPDX-License-Identifier: Apache-2.0
//
// Requests that are delivered later, on another thread than the one that has read them.
#include <atomic>
#include <chrono>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/messaging/MessagingRig.h"
#include "platform/linux/socket/RawClient.h"
#include "platform/linux/socket/UnixSocketListener.h"
#include "protocol/Requests.h"
#include "support/TemporaryDirectory.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"
#include "values/PackedMap.h"
#include "values/ShapeTable.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::SizeIs;

// What a handler was given, by the messaging thread and by the test.
class Deliveries {
 public:
  struct Call {
    std::string method;
    Arguments arguments;
    std::thread::id thread;
  };

  void keep(std::unique_ptr<ReceivedRequests> requests) {
    const MutexLock lock(mutex_);
    waiting_.push_back(std::move(requests));
    changed_.notifyAll();
  }
  void add(Call call) {
    const MutexLock lock(mutex_);
    calls_.push_back(std::move(call));
    changed_.notifyAll();
  }

  // Takes out the requests that wait, once there are any.
  std::vector<std::unique_ptr<ReceivedRequests>> takeWaiting() {
    MutexLock lock(mutex_);
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    while (waiting_.empty() && changed_.waitUntil(lock, deadline)) {
    }
    return std::exchange(waiting_, {});
  }
  std::vector<std::unique_ptr<ReceivedRequests>> takeWaitingNow() {
    const MutexLock lock(mutex_);
    return std::exchange(waiting_, {});
  }
  [[nodiscard]] bool waitForCalls(std::size_t count) const {
    MutexLock lock(mutex_);
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    while (calls_.size() < count && changed_.waitUntil(lock, deadline)) {
    }
    return calls_.size() >= count;
  }
  std::vector<Call> calls() const {
    const MutexLock lock(mutex_);
    return calls_;
  }
  std::vector<std::string> methods() const {
    std::vector<std::string> names;
    for (const Call& call : calls()) names.push_back(call.method);
    return names;
  }

 private:
  mutable Mutex mutex_;
  mutable Condition changed_;
  std::vector<std::unique_ptr<ReceivedRequests>> waiting_ GUARDED_BY(mutex_);
  std::vector<Call> calls_ GUARDED_BY(mutex_);
};

// Keeps what it receives until the test delivers it. Requests of "fail" are urgent, those of "takeInt64"
// quick.
class LateHandler final : public RequestHandler {
 public:
  explicit LateHandler(Deliveries& deliveries) : deliveries_(deliveries) {}

  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken) override {
    const Argument first = arguments.empty() ? Argument() : arguments.front();
    deliveries_.add({nameOf(method), std::move(arguments), std::this_thread::get_id()});
    reply(std::nullopt, first);
  }
  void handleReceived(std::unique_ptr<ReceivedRequests> requests) override {
    deliveries_.keep(std::move(requests));
  }
  bool isUrgent(std::size_t method) override { return nameOf(method) == "fail"; }
  bool isQuick(std::size_t method, const IncomingMessage* /*message*/) const override {
    return nameOf(method) == "takeInt64";
  }

 private:
  static std::string nameOf(std::size_t method) { return std::string(rigInterface().methods[method].name); }

  Deliveries& deliveries_;
};

// Keeps requests of the daemon's own set as LateHandler does. Messages of all types but kTypeError are quick.
class MessageHandler final : public RequestHandler {
 public:
  explicit MessageHandler(Deliveries& deliveries) : deliveries_(deliveries) {}

  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken) override {
    deliveries_.add(
        {std::string(requests::kAll[method].name), std::move(arguments), std::this_thread::get_id()});
    reply(std::nullopt);
  }
  void handleMessage(std::size_t, IncomingMessage& message, Reply reply, InFlightToken) override {
    EXPECT_NE(message.payload.packed(), nullptr);
    deliveries_.add({"message", message.arguments(), std::this_thread::get_id()});
    reply(std::nullopt);
  }
  void handleReceived(std::unique_ptr<ReceivedRequests> requests) override {
    deliveries_.keep(std::move(requests));
  }
  bool isQuick(std::size_t, const IncomingMessage* message) const override {
    return message != nullptr && message->type != kTypeError;
  }
  void expectMessage(ReporterID session) override {
    deliveries_.add({"expect", {Value(session)}, std::this_thread::get_id()});
  }
  ShapeTable* shapes() override { return &shapes_; }

 private:
  Deliveries& deliveries_;
  ShapeTable shapes_;
};

class LateDelegate final : public MessagingListenerDelegate {
 public:
  explicit LateDelegate(Deliveries& deliveries) : deliveries_(deliveries) {}

  std::atomic<bool> takesMessages = false;  // of connections to come

  bool listenerShouldAcceptNewConnection(MessagingConnection& connection) override {
    if (takesMessages) {
      connection.setRequestHandler(requests::all(), std::make_shared<MessageHandler>(deliveries_));
    } else {
      connection.setRequestHandler(rigInterface(), std::make_shared<LateHandler>(deliveries_));
    }
    connection.resume();
    return true;
  }

 private:
  Deliveries& deliveries_;
};

std::string requestOf(std::uint32_t identifier, std::string_view method, const Arguments& arguments) {
  std::string frame;
  RpcWriter(frame).request(identifier, method, arguments);
  return frame;
}

std::string notificationOf(std::string_view method, const Arguments& arguments) {
  std::string frame;
  RpcWriter(frame).notification(method, arguments);
  return frame;
}

template <typename Number>
std::string numberOf(Number number) {
  return notificationOf("takeInt64", {Value(number)});
}

class UnixRequestsTest : public testing::Test {
 protected:
  UnixRequestsTest() {
    std::string problem;
    auto socket = ServerSocket::open(path, problem);
    EXPECT_NE(socket, nullptr) << problem;
    listener = std::make_unique<UnixSocketListener>(std::move(socket), category, accounts);
    listener->setDelegate(delegate);
    listener->resume();
  }

  // Delivers what waits, and what comes meanwhile, until the handler has had `count` calls.
  void deliverUntil(std::size_t count) {
    while (deliveries.calls().size() < count) {
      auto waiting = deliveries.takeWaiting();
      ASSERT_FALSE(waiting.empty()) << "only " << deliveries.calls().size() << " requests came";
      for (const auto& requests : waiting) EXPECT_TRUE(requests->deliver());
    }
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  MemoryLog log;
  LogCategory category{log, "com.example", "twrs"};
  TestAccounts accounts;
  Deliveries deliveries;
  LateDelegate delegate{deliveries};
  std::unique_ptr<UnixSocketListener> listener;
};

TEST_F(UnixRequestsTest, TheRequestsOfOneReadArePassedOnTogether) {
  RawClient client(path);
  ASSERT_TRUE(client.send(numberOf(1) + notificationOf("takeMap", {Value(ValueMap{})}) + numberOf(3)));
  const auto waiting = deliveries.takeWaiting();
  ASSERT_THAT(waiting, SizeIs(1));
  EXPECT_THAT(deliveries.calls(), SizeIs(0));
  EXPECT_TRUE(waiting[0]->deliver());
  EXPECT_THAT(deliveries.methods(), ElementsAre("takeInt64", "takeMap", "takeInt64"));
  for (const auto& call : deliveries.calls()) EXPECT_EQ(call.thread, std::this_thread::get_id());
}

TEST_F(UnixRequestsTest, AnUrgentRequestWaitsForNothingAndRunsOnTheMessagingThread) {
  RawClient client(path);
  ASSERT_TRUE(client.send(numberOf(1) + notificationOf("fail", {}) + numberOf(3)));
  ASSERT_TRUE(deliveries.waitForCalls(1));
  EXPECT_THAT(deliveries.methods(), ElementsAre("fail"));
  EXPECT_NE(deliveries.calls()[0].thread, std::this_thread::get_id());
  deliverUntil(3);
  EXPECT_THAT(deliveries.methods(), ElementsAre("fail", "takeInt64", "takeInt64"));
  EXPECT_EQ(deliveries.calls()[2].arguments, Arguments{Value(3)});
}

TEST_F(UnixRequestsTest, ABadRequestIsAnsweredWhenItsTurnComes) {
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(1, "takeInt64", {Value(1)}) + requestOf(2, "unheardOf", {}) +
                          requestOf(3, "takeInt64", {Value("text")})));
  deliverUntil(1);
  for (const std::uint32_t identifier : {1U, 2U, 3U}) {
    const auto response = client.response();
    ASSERT_TRUE(response);
    EXPECT_EQ(response->identifier, identifier);
    EXPECT_EQ(response->error.has_value(), identifier != 1);
  }
  EXPECT_THAT(deliveries.calls(), SizeIs(1));
}

TEST_F(UnixRequestsTest, QuickRequestsAreDeliveredUpToTheFirstThatIsNotAndTheOthersLater) {
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(1, "takeInt64", {Value(1)}) + requestOf(2, "takeInt64", {Value(2)}) +
                          requestOf(3, "takeMap", {Value(ValueMap{})}) +
                          requestOf(4, "takeInt64", {Value(4)})));
  const auto waiting = deliveries.takeWaiting();
  ASSERT_THAT(waiting, SizeIs(1));
  EXPECT_FALSE(waiting[0]->deliverQuick());
  EXPECT_THAT(deliveries.methods(), ElementsAre("takeInt64", "takeInt64"));
  EXPECT_TRUE(waiting[0]->deliver());
  EXPECT_THAT(deliveries.methods(), ElementsAre("takeInt64", "takeInt64", "takeMap", "takeInt64"));
  for (const std::uint32_t identifier : {1U, 2U, 3U, 4U}) {
    const auto response = client.response();
    ASSERT_TRUE(response);
    EXPECT_EQ(response->identifier, identifier);
  }
}

TEST_F(UnixRequestsTest, RequestsThatAreAllQuickOrBadNeedNoSecondDelivery) {
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(1, "unheardOf", {}) + requestOf(2, "takeInt64", {Value("text")}) +
                          requestOf(3, "takeInt64", {Value(3)})));
  const auto waiting = deliveries.takeWaiting();
  ASSERT_THAT(waiting, SizeIs(1));
  EXPECT_TRUE(waiting[0]->deliverQuick());
  for (const std::uint32_t identifier : {1U, 2U, 3U}) {
    const auto response = client.response();
    ASSERT_TRUE(response);
    EXPECT_EQ(response->identifier, identifier);
    EXPECT_EQ(response->error.has_value(), identifier != 3);
  }
  EXPECT_THAT(deliveries.calls(), SizeIs(1));
}

std::string messageOf(std::int64_t number, AudioEventType type) {
  return notificationOf(requests::kSendMessage.name,
                        {ValueMap{{"number", number}}, 4, type, Value(ValueArray({number}))});
}

TEST_F(UnixRequestsTest, AMessageThatIsNotQuickIsKeptAndDeliveredWholeLater) {
  delegate.takesMessages = true;
  RawClient client(path);
  ASSERT_TRUE(client.send(messageOf(1, kTypeStart) + messageOf(2, kTypeError) + messageOf(3, kTypeStart)));
  const auto waiting = deliveries.takeWaiting();
  ASSERT_THAT(waiting, SizeIs(1));
  EXPECT_FALSE(waiting[0]->deliverQuick());
  EXPECT_THAT(deliveries.methods(), ElementsAre("message"));
  EXPECT_TRUE(waiting[0]->deliver());
  ASSERT_THAT(deliveries.methods(), ElementsAre("message", "message", "message"));
  for (std::int64_t number = 1; number <= 3; ++number) {
    const auto call = deliveries.calls()[static_cast<std::size_t>(number - 1)];
    EXPECT_EQ(call.arguments[0], Value(ValueMap{{"number", number}}));
    EXPECT_EQ(call.arguments[2], Value(number == 2 ? kTypeError : kTypeStart));
  }
}

TEST_F(UnixRequestsTest, ARequestThatIsNotQuickIsNotLookedAtBeforeItsTurn) {
  delegate.takesMessages = true;
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(1, requests::kSetConfiguration.name, {Value("no map"), Value(7)})));
  const auto waiting = deliveries.takeWaiting();
  ASSERT_THAT(waiting, SizeIs(1));
  EXPECT_FALSE(waiting[0]->deliverQuick());
  EXPECT_TRUE(waiting[0]->deliver());
  const auto response = client.response();
  ASSERT_TRUE(response);
  EXPECT_TRUE(response->error.has_value());
  EXPECT_THAT(deliveries.calls(), SizeIs(0));
}

TEST_F(UnixRequestsTest, MessagesAreExpectedAFewMessagesBeforeTheyAreDelivered) {
  delegate.takesMessages = true;
  RawClient client(path);
  std::string frames;
  for (std::int64_t number = 1; number <= 5; ++number) frames += messageOf(number, kTypeStart);
  ASSERT_TRUE(client.send(frames));
  const auto waiting = deliveries.takeWaiting();
  ASSERT_THAT(waiting, SizeIs(1));
  EXPECT_TRUE(waiting[0]->deliverQuick());
  EXPECT_THAT(deliveries.methods(),
              ElementsAre("expect", "message", "expect", "message", "message", "message", "message"));
  EXPECT_EQ(deliveries.calls()[0].arguments, Arguments{Value(1 + RequestHandler::kExpectedAhead)});
}

TEST_F(UnixRequestsTest, FramesThatComeInSeveralReadsAreWhole) {
  RawClient client(path);
  std::string sent;
  std::vector<Value> expected;
  for (const std::size_t size : {10UL, 300'000UL, 5UL, 70'000UL, 65'536UL, 1UL, 1'000'000UL, 3UL}) {
    expected.emplace_back(ValueMap{{"text", std::string(size, static_cast<char>('a' + expected.size()))}});
    sent += notificationOf("takeMap", {expected.back()});
  }
  std::thread sender([&] {
    // Uneven pieces, so that frames begin and end anywhere in a read.
    for (std::size_t at = 0; at < sent.size(); at += 7'777) {
      EXPECT_TRUE(client.send(std::string_view(sent).substr(at, 7'777)));
    }
  });
  deliverUntil(expected.size());
  sender.join();
  std::vector<Value> received;
  for (const auto& call : deliveries.calls()) received.push_back(*call.arguments.at(0));
  EXPECT_EQ(received, expected);
}

TEST_F(UnixRequestsTest, AFrameThatComesByteByByteIsWhole) {
  RawClient client(path);
  const Value map(ValueMap{{"key", ValueArray{1, "text"}}});
  for (const char byte : requestOf(7, "echo", {map})) ASSERT_TRUE(client.send({&byte, 1}));
  deliverUntil(1);
  const auto response = client.response();
  ASSERT_TRUE(response);
  EXPECT_EQ(response->identifier, 7U);
  EXPECT_EQ(response->result, map);
}

TEST_F(UnixRequestsTest, RequestsThatWaitAreUnfinishedAndDroppedOnesFinished) {
  constexpr std::size_t kTooMany = 100;
  RawClient client(path);
  std::string frames;
  for (std::size_t at = 0; at < kMaxUnfinishedRequests + kTooMany; ++at) frames += numberOf(at);
  ASSERT_TRUE(client.send(frames));
  auto waiting = deliveries.takeWaiting();
  // The answer to another client shows that the thread has read all that it will read.
  RawClient other(path);
  ASSERT_TRUE(other.send(requestOf(1, "fail", {})));
  ASSERT_TRUE(other.response());
  for (auto& more : deliveries.takeWaitingNow()) waiting.push_back(std::move(more));

  waiting.clear();  // without delivery
  deliverUntil(1 + kTooMany);
  EXPECT_EQ(deliveries.calls().back().arguments, Arguments{Value(kMaxUnfinishedRequests + kTooMany - 1)});
  EXPECT_THAT(deliveries.calls(), SizeIs(1 + kTooMany));
}

TEST_F(UnixRequestsTest, RequestsOutliveTheirConnectionAndItsListener) {
  {
    RawClient client(path);
    ASSERT_TRUE(client.send(requestOf(1, "takeInt64", {Value(5)})));
  }
  const auto waiting = deliveries.takeWaiting();
  ASSERT_THAT(waiting, SizeIs(1));
  listener = nullptr;
  EXPECT_TRUE(waiting[0]->deliver());
  ASSERT_THAT(deliveries.calls(), SizeIs(1));
  EXPECT_EQ(deliveries.calls()[0].arguments, Arguments{Value(5)});
}

}  // namespace
}  // namespace tonewerk
