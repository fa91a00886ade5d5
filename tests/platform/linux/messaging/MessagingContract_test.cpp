// SPDX-License-Identifier: Apache-2.0
//
// Tests that every messaging listener must pass: over sockets, over D-Bus, and the fake in memory.
#include <gmock/gmock.h>
#include <map>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/linux/dbus/DbusCaller.h"
#include "platform/linux/dbus/DbusListener.h"
#include "platform/linux/dbus/DbusValues.h"
#include "platform/linux/dbus/PrivateBus.h"
#include "platform/linux/messaging/AllocatorReclaimer.h"
#include "platform/linux/messaging/MessagingRig.h"
#include "platform/linux/socket/UnixSocketListener.h"
#include "support/TemporaryDirectory.h"
#include "support/TestAccounts.h"
#include "support/client/ReportingClient.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualTimers.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryMessaging.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::SizeIs;

// The error texts of a side. D-Bus has its own, because it uses other method names.
struct PlainTexts {
  static constexpr const char* kUnknownMethod = "unknown method noSuchMethod";
  static constexpr const char* kWrongType = "takeTwo: argument 2 (number) must be a signed 64-bit integer";
  static constexpr const char* kTooFew = "takeTwo takes 2 arguments, not 1";
};

class MemorySide {
 public:
  using Texts = PlainTexts;

  explicit MemorySide(MessagingListenerDelegate& delegate) {
    messaging_.setDelegate(delegate);
    messaging_.resume();
  }
  static std::int32_t clientProcess() { return 77; }
  static std::uint32_t clientUser() { return MemoryMessaging::kOwner; }
  void connect() { client_ = messaging_.connect(clientProcess()); }
  void request(std::string_view method, Arguments arguments) {
    client_->request(method, std::move(arguments));
  }
  void notify(std::string_view method, Arguments arguments) { client_->notify(method, std::move(arguments)); }
  std::vector<Answer> answers(std::size_t count) {
    EXPECT_TRUE(client_->waitForResponses(count));
    std::vector<Answer> answers;
    for (const MemoryResponse& response : client_->responses())
      answers.push_back({response.error, response.result});
    return answers;
  }
  void disconnect() { client_->disconnect(); }
  void shutDown() { messaging_.shutDown(); }
  // True while the client is accepted and connected.
  bool isServed() { return client_ != nullptr && !client_->hasEnded(); }

 private:
  MemoryMessaging messaging_;
  std::unique_ptr<MemoryClient> client_;
};

class SocketSide {
 public:
  using Texts = PlainTexts;

  explicit SocketSide(MessagingListenerDelegate& delegate, AllocatorReclaimer* memory = nullptr) {
    std::string problem;
    auto socket = ServerSocket::open(path_, problem);
    EXPECT_NE(socket, nullptr) << problem;
    listener_ =
        std::make_unique<UnixSocketListener>(std::move(socket), category_, accounts_, nullptr, memory);
    listener_->setDelegate(delegate);
    listener_->resume();
  }
  static std::int32_t clientProcess() { return ::getpid(); }
  static std::uint32_t clientUser() { return ::geteuid(); }
  void connect() { EXPECT_FALSE(client_.connect({path_})); }
  void request(std::string_view method, const Arguments& arguments) {
    EXPECT_FALSE(
        client_.request(method, arguments, [this](const Answer& answer) { answers_.push_back(answer); }));
  }
  void notify(std::string_view method, const Arguments& arguments) {
    EXPECT_FALSE(client_.notify(method, arguments));
  }
  std::vector<Answer> answers(std::size_t count) {
    while (answers_.size() < count && !client_.processAnswers(kPatience)) {
    }
    return answers_;
  }
  void disconnect() { client_.disconnect(); }
  void shutDown() { listener_->shutDown(); }
  bool isServed() {
    std::error_code error;
    return client_.call("takeInt64", {Value(1)}, kPatience, error).has_value();
  }

 private:
  TemporaryDirectory directory_;
  const std::string path_ = directory_.path("reporting.sock");
  MemoryLog log_;
  LogCategory category_{log_, "com.example", "twrs"};
  TestAccounts accounts_;
  std::unique_ptr<UnixSocketListener> listener_;
  ReportingClient client_;
  std::vector<Answer> answers_;
};

class DbusSide {
 public:
  struct Texts {
    static constexpr const char* kUnknownMethod = "Unknown method NoSuchMethod or interface com.example.Rig.";
    static constexpr const char* kWrongType = "TakeTwo: argument 2 (number) must be of the type x, not d";
    static constexpr const char* kTooFew = "TakeTwo takes 2 arguments (a{sv}x), not 1";
  };

  explicit DbusSide(MessagingListenerDelegate& delegate, AllocatorReclaimer* memory = nullptr)
      : listener_(kNames, rigInterface(), bus_.address(), category_, accounts_, memory) {
    listener_.setDelegate(delegate);
    listener_.resume();
  }
  static std::int32_t clientProcess() { return ::getpid(); }
  static std::uint32_t clientUser() { return ::getuid(); }
  // The listener learns of a client by its first request. This one has wrong arguments and wants no answer.
  void connect() {
    waitForName();
    caller_ = std::make_unique<DbusCaller>(bus_.address(), kNames);
    caller_->sendWithoutAnswer(caller_->newCall("TakeInt64"));
    EXPECT_GE(sd_bus_flush(caller_->bus()), 0);
  }
  void request(std::string_view method, const Arguments& arguments) {
    caller_->send(callOf(method, arguments));
    EXPECT_GE(sd_bus_flush(caller_->bus()), 0);
  }
  void notify(std::string_view method, const Arguments& arguments) {
    caller_->sendWithoutAnswer(callOf(method, arguments));
    EXPECT_GE(sd_bus_flush(caller_->bus()), 0);
  }
  std::vector<Answer> answers(std::size_t count) {
    EXPECT_TRUE(caller_->waitForReceived(count));
    std::vector<Answer> answers;
    for (const DbusReceived& received : caller_->received()) answers.push_back(answerOf(received));
    return answers;
  }
  void disconnect() { caller_->disconnect(); }
  void shutDown() { listener_.shutDown(); }
  bool isServed() {
    return caller_->ask("TakeInt64", "x", std::int64_t{1}).error != SD_BUS_ERROR_ACCESS_DENIED;
  }

 private:
  inline static const DbusNames kNames{"com.example.rig", "/com/example/rig", "com.example.Rig"};

  void waitForName() {
    DbusCaller asker(bus_.address(),
                     {"org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus"});
    const auto end = std::chrono::steady_clock::now() + kPatience;
    while (!asker.ask("NameHasOwner", "s", kNames.name.c_str()).boolean()) {
      ASSERT_LT(std::chrono::steady_clock::now(), end);
      ASSERT_GE(sd_bus_wait(asker.bus(), 10'000), 0);  // microseconds; for the name to come
    }
  }

  BusMessage callOf(std::string_view method, const Arguments& arguments) {
    std::string member(method);
    member[0] = static_cast<char>(member[0] - 'a' + 'A');
    BusMessage call = caller_->newCall(member.c_str());
    for (const Argument& argument : arguments) append(call.get(), *argument);
    return call;
  }
  static void append(sd_bus_message* call, const Value& argument) {
    if (argument.asMap() != nullptr) return appendMap(call, *argument.asMap());
    if (const std::int64_t* number = argument.asInteger()) {
      EXPECT_GE(sd_bus_message_append(call, "x", *number), 0);
    } else if (const double* real = argument.asDouble()) {
      EXPECT_GE(sd_bus_message_append(call, "d", *real), 0);
    } else {
      EXPECT_GE(sd_bus_message_append(call, "s", argument.text().c_str()), 0);
    }
  }

  static Answer answerOf(const DbusReceived& received) {
    if (received.error == SD_BUS_ERROR_UNKNOWN_METHOD)
      return {messagingError(kUnknownMethod, received.text), {}};
    if (received.error == SD_BUS_ERROR_INVALID_ARGS)
      return {messagingError(kInvalidArguments, received.text), {}};
    if (received.error == "com.example.Error.Code7") return {ReplyError{"com.example", 7, ""}, {}};
    if (!received.error.empty()) return {ReplyError{received.error, 0, received.text}, {}};
    if (received.signature().empty()) return {};
    return {std::nullopt, readVariant(received.message.get())};
  }

  PrivateBus bus_;
  MemoryLog log_;
  LogCategory category_{log_, "com.example", "twrs"};
  TestAccounts accounts_;
  DbusListener listener_;
  std::unique_ptr<DbusCaller> caller_;
};

template <typename Side>
class MessagingContractTest : public testing::Test {
 protected:
  MessagingRecord record;
  RigDelegate delegate{record};
  Side side{delegate};
};

using Sides = testing::Types<MemorySide, SocketSide, DbusSide>;
TYPED_TEST_SUITE(MessagingContractTest, Sides);

TYPED_TEST(MessagingContractTest, TellsTheDelegateTheClientsProcessAndUser) {
  this->side.connect();
  ASSERT_TRUE(this->record.waitForEvents(1));
  EXPECT_EQ(this->delegate.lastProcessIdentifier, TypeParam::clientProcess());
  EXPECT_EQ(this->delegate.lastUserIdentifier, TypeParam::clientUser());
}

TYPED_TEST(MessagingContractTest, LetsItsOwnUserCallTheMethodsForTrustedUsers) {
  this->side.connect();
  this->side.request("takeFromOwner", {Value(1)});
  const std::vector<Answer> answers = this->side.answers(1);
  ASSERT_THAT(answers, SizeIs(1));
  EXPECT_FALSE(answers[0].error);
  EXPECT_THAT(this->record.requests(), SizeIs(1));
}

TYPED_TEST(MessagingContractTest, DoesNotServeAClientThatTheDelegateRejects) {
  this->delegate.rejectsClients = true;
  this->side.connect();
  ASSERT_TRUE(this->record.waitForEvents(1));
  EXPECT_FALSE(this->side.isServed());
  EXPECT_THAT(this->record.events(), ElementsAre("turned away"));
}

TYPED_TEST(MessagingContractTest, HandsRequestsOverInOrder) {
  this->side.connect();
  this->side.request("takeInt64", {Value(1)});
  this->side.notify("takeInt64", {Value(2)});
  this->side.request("takeInt64", {Value(3)});
  ASSERT_TRUE(this->record.waitForRequests(3));
  std::vector<std::int64_t> numbers;
  for (const ReceivedRequest& request : this->record.requests()) {
    numbers.push_back(request.arguments.at(0)->integer());
  }
  EXPECT_THAT(numbers, ElementsAre(1, 2, 3));
}

TYPED_TEST(MessagingContractTest, CarriesEveryKindOfValueInBothDirections) {
  const ValueMap map{{"boolean", true},
                     {"negative", -5},
                     {"large", std::uint64_t{18446744073709551615U}},
                     {"double", 0.25},
                     {"whole double", 2.0},
                     {"text",
                      "Gr\xC3\xBC\xC3\x9F"
                      "e"},
                     {"date", Date{1763634000.5}},
                     {"array", ValueArray{1, "two", ValueArray{}}},
                     {"map", ValueMap{{"inner", 3.5}}},
                     {"", "empty key"}};
  this->side.connect();
  this->side.request("echo", {Value(map)});
  const std::vector<Answer> answers = this->side.answers(1);
  ASSERT_THAT(answers, SizeIs(1));
  ASSERT_TRUE(answers[0].result && answers[0].result->asMap());
  EXPECT_EQ(*answers[0].result->asMap(), map);
  EXPECT_EQ(answers[0].result->asMap()->find("date")->kind(), Value::Kind::kDate);
  EXPECT_EQ(answers[0].result->asMap()->find("whole double")->kind(), Value::Kind::kDouble);
  EXPECT_EQ(answers[0].result->asMap()->find("boolean")->kind(), Value::Kind::kBoolean);
}

TYPED_TEST(MessagingContractTest, NeverAnswersANotification) {
  this->side.connect();
  this->side.notify("echo", {Value(ValueMap{})});
  this->side.notify("noSuchMethod", {});
  this->side.notify("takeInt64", {Value("text")});
  this->side.request("takeInt64", {Value(1)});
  EXPECT_THAT(this->side.answers(1), SizeIs(1));
  EXPECT_THAT(this->record.requests(), SizeIs(2));
}

TYPED_TEST(MessagingContractTest, AnswersWithTheObjectsOwnError) {
  this->side.connect();
  this->side.request("fail", {});
  const std::vector<Answer> answers = this->side.answers(1);
  ASSERT_THAT(answers, SizeIs(1));
  EXPECT_EQ(answers[0].error, (ReplyError{"com.example", 7, ""}));
  EXPECT_FALSE(answers[0].result);
}

TYPED_TEST(MessagingContractTest, RefusesAnUnknownMethodAndStaysConnected) {
  this->side.connect();
  this->side.request("noSuchMethod", {Value(1)});
  this->side.request("takeInt64", {Value(1)});
  const std::vector<Answer> answers = this->side.answers(2);
  ASSERT_THAT(answers, SizeIs(2));
  EXPECT_EQ(answers[0].error, messagingError(kUnknownMethod, TypeParam::Texts::kUnknownMethod));
  EXPECT_FALSE(answers[1].error);
}

TYPED_TEST(MessagingContractTest, RefusesUnsuitableArgumentsAndStaysConnected) {
  this->side.connect();
  this->side.request("takeTwo", {Value(ValueMap{}), Value(1.0)});
  this->side.request("takeTwo", {Value(ValueMap{})});
  this->side.request("takeTwo", {Value(ValueMap{}), Value(1)});
  const std::vector<Answer> answers = this->side.answers(3);
  ASSERT_THAT(answers, SizeIs(3));
  EXPECT_EQ(answers[0].error, messagingError(kInvalidArguments, TypeParam::Texts::kWrongType));
  EXPECT_EQ(answers[1].error, messagingError(kInvalidArguments, TypeParam::Texts::kTooFew));
  EXPECT_FALSE(answers[2].error);
  EXPECT_THAT(this->record.requests(), SizeIs(1));
}

TYPED_TEST(MessagingContractTest, AnswersLaterAndOutOfOrder) {
  this->side.connect();
  this->side.request("hold", {Value(1)});
  this->side.request("hold", {Value(2)});
  ASSERT_TRUE(this->record.waitForHeld(2));
  auto held = this->record.takeHeld();
  held[1].first(std::nullopt, Value("second"));
  held[0].first(std::nullopt, Value("first"));
  const std::vector<Answer> answers = this->side.answers(2);
  ASSERT_THAT(answers, SizeIs(2));
  EXPECT_EQ(answers[0].result, Value("second"));
  EXPECT_EQ(answers[1].result, Value("first"));
}

TYPED_TEST(MessagingContractTest, RunsItsHandlersOnceInOrderAndThenDestroysTheObject) {
  this->side.connect();
  ASSERT_TRUE(this->record.waitForEvents(1));
  this->side.disconnect();
  ASSERT_TRUE(this->record.waitForEvents(4));
  this->side.shutDown();
  EXPECT_THAT(this->record.events(), ElementsAre("accepted", "interrupted", "invalidated", "object gone"));
}

TYPED_TEST(MessagingContractTest, EndsEveryConnectionBeforeShuttingDownReturns) {
  this->side.connect();
  ASSERT_TRUE(this->record.waitForEvents(1));
  this->side.shutDown();
  EXPECT_THAT(this->record.events(), ElementsAre("accepted", "interrupted", "invalidated", "object gone"));
  this->side.shutDown();
  EXPECT_THAT(this->record.events(), SizeIs(4));
}

TYPED_TEST(MessagingContractTest, DropsRepliesToAClientThatIsGone) {
  this->side.connect();
  this->side.request("hold", {Value(1)});
  ASSERT_TRUE(this->record.waitForHeld(1));
  this->side.disconnect();
  ASSERT_TRUE(this->record.waitForEvents(4));
  auto held = this->record.takeHeld();
  held[0].first(std::nullopt, Value("late"));
  this->side.connect();
  this->side.request("takeInt64", {Value(1)});
  const std::vector<Answer> answers = this->side.answers(1);
  ASSERT_THAT(answers, SizeIs(1));
  EXPECT_FALSE(answers[0].result);
}

TYPED_TEST(MessagingContractTest, DropsRepliesAfterShuttingDown) {
  this->side.connect();
  this->side.request("hold", {Value(1)});
  ASSERT_TRUE(this->record.waitForHeld(1));
  this->side.shutDown();
  auto held = this->record.takeHeld();
  held[0].first(std::nullopt, Value("late"));
  held.clear();
  EXPECT_THAT(this->record.events(), SizeIs(4));
}

// Tests what each listener for other processes reports to the reclaimer, which has a timer while checks are
// scheduled.
template <typename Side>
class ReclaimingContractTest : public testing::Test {
 protected:
  ManualClock clock;
  ManualTimers timers{clock};
  AllocatorReclaimer memory{timers, {[] { return std::size_t{0}; }, [] {}}};
  MessagingRecord record;
  RigDelegate delegate{record};
  Side side{delegate, &memory};
};

using SidesOfProcesses = testing::Types<SocketSide, DbusSide>;
TYPED_TEST_SUITE(ReclaimingContractTest, SidesOfProcesses);

// Many small clients leave as much memory behind as a large one, although none of them sends much.
TYPED_TEST(ReclaimingContractTest, SchedulesChecksOnceAllClientsTogetherHaveSentEnough) {
  constexpr std::size_t kClients = 5;
  const std::string text(AllocatorReclaimer::kSentBytesThreshold / kClients, 'x');
  for (std::size_t client = 1; client <= kClients; ++client) {
    EXPECT_EQ(this->timers.count(), 0U);
    this->side.connect();
    this->side.notify("takeMap", {Value(ValueMap{{"text", text}})});
    ASSERT_TRUE(this->record.waitForRequests(client));
    if (client == kClients) break;
    this->side.disconnect();
    ASSERT_TRUE(this->record.waitForEvents(4 * client));
  }
  EXPECT_EQ(this->timers.count(), 1U);
}

TYPED_TEST(ReclaimingContractTest, SchedulesChecksAtAClientsEnd) {
  this->memory.clientSent(AllocatorReclaimer::kSentBytesThreshold);
  this->side.connect();
  ASSERT_TRUE(this->record.waitForEvents(1));
  this->clock.advance(100.0);  // lets the scheduled checks run
  ASSERT_EQ(this->timers.count(), 0U);
  this->side.disconnect();
  ASSERT_TRUE(this->record.waitForEvents(4));
  this->side.shutDown();
  EXPECT_EQ(this->timers.count(), 1U);
}

}  // namespace
}  // namespace tonewerk
