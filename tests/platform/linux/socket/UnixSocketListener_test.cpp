// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/UnixSocketListener.h"

#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <future>
#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <string>
#include <sys/file.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/messaging/MessagingRig.h"
#include "platform/linux/protobuf/Hex.h"
#include "platform/linux/socket/RawClient.h"
#include "platform/linux/threads/SystemClock.h"
#include "support/InterceptedCalls.h"
#include "support/OtherUser.h"
#include "support/TemporaryDirectory.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using namespace std::chrono_literals;

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

class UnixSocketListenerTest : public testing::Test {
 protected:
  UnixSocketListenerTest() {
    std::string problem;
    auto socket = ServerSocket::open(path, problem);
    EXPECT_NE(socket, nullptr) << problem;
    listener = std::make_unique<UnixSocketListener>(std::move(socket), category, accounts);
    listener->setDelegate(delegate);
  }

  void SetUp() override { listener->resume(); }

  // Sends a request and expects it to be answered without an error: the connection lives.
  static void expectServed(RawClient& client) {
    ASSERT_TRUE(client.send(requestOf(99, "takeInt64", {Value(1)})));
    const std::optional<RpcFrame> response = client.response();
    ASSERT_TRUE(response);
    EXPECT_EQ(response->identifier, 99U);
    EXPECT_FALSE(response->error);
  }

  std::vector<std::string> errorLines() const { return log.textsOf("twrs", LogLevel::kError); }

  // The number of requests so far whose first arguments count up from 0.
  std::size_t countedUp() const {
    std::int64_t next = 0;
    for (const ReceivedRequest& request : record.requests()) {
      if (request.arguments.empty() || request.arguments[0]->integer() != next) break;
      ++next;
    }
    return static_cast<std::size_t>(next);
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  MemoryLog log;
  LogCategory category{log, "com.example", "twrs"};
  TestAccounts accounts;
  MessagingRecord record;
  RigDelegate delegate{record};
  std::unique_ptr<UnixSocketListener> listener;
};

struct WrongArgument {
  const char* method;
  const char* arguments;  // their array, in hexadecimal
  const char* message;
};

class WrongArgumentTest : public UnixSocketListenerTest, public testing::WithParamInterface<WrongArgument> {};

TEST_P(WrongArgumentTest, IsAnErrorThatNamesTheArgumentAndKeepsTheConnection) {
  RawClient client(path);
  const std::string method = GetParam().method;
  ASSERT_TRUE(client.send(fromHex("94 00 01") + static_cast<char>(0xA0 + method.size()) + method +
                          fromHex(GetParam().arguments)));
  const std::optional<RpcFrame> response = client.response();
  ASSERT_TRUE(response && response->error && response->error->asMap());
  EXPECT_EQ(response->identifier, 1U);
  EXPECT_FALSE(response->result);
  const ValueMap expected{
      {"domain", kMessagingErrorDomain}, {"code", kInvalidArguments}, {"message", GetParam().message}};
  EXPECT_EQ(*response->error->asMap(), expected) << response->error->text();
  EXPECT_THAT(record.requests(), IsEmpty());
  expectServed(client);
}

constexpr const char* kNotInt64 = "takeInt64: argument 1 (number) must be a signed 64-bit integer";
constexpr const char* kNotUInt32 = "takeUInt32: argument 1 (number) must be an integer from 0 to 4294967295";
constexpr const char* kNotUInt16 = "takeUInt16: argument 1 (number) must be an integer from 0 to 65535";
constexpr const char* kNotMap = "takeMap: argument 1 (map) must be a map";
constexpr const char* kNotList =
    "takeList: argument 1 (list) must be a list of signed 64-bit integers or nil";

INSTANTIATE_TEST_SUITE_P(
    All, WrongArgumentTest,
    testing::Values(
        WrongArgument{"takeInt64", "90", "takeInt64 takes 1 arguments, not 0"},
        WrongArgument{"takeInt64", "92 01 02", "takeInt64 takes 1 arguments, not 2"},
        WrongArgument{"takeInt64", "91 C0", kNotInt64}, WrongArgument{"takeInt64", "91 C3", kNotInt64},
        WrongArgument{"takeInt64", "91 CB 3FF0000000000000", kNotInt64},
        WrongArgument{"takeInt64", "91 CA 3F800000", kNotInt64},
        WrongArgument{"takeInt64", "91 CF 8000000000000000", kNotInt64},
        WrongArgument{"takeInt64", "91 A1 31", kNotInt64}, WrongArgument{"takeInt64", "91 90", kNotInt64},
        WrongArgument{"takeInt64", "91 80", kNotInt64},
        WrongArgument{"takeInt64", "91 D6 FF 00000001", kNotInt64},
        WrongArgument{"takeUInt32", "91 FF", kNotUInt32},
        WrongArgument{"takeUInt32", "91 CF 0000000100000000", kNotUInt32},
        WrongArgument{"takeUInt32", "91 CB 3FF0000000000000", kNotUInt32},
        WrongArgument{"takeUInt32", "91 C0", kNotUInt32}, WrongArgument{"takeUInt16", "91 FF", kNotUInt16},
        WrongArgument{"takeUInt16", "91 CE 00010000", kNotUInt16},
        WrongArgument{"takeUInt16", "91 C2", kNotUInt16}, WrongArgument{"takeMap", "91 90", kNotMap},
        WrongArgument{"takeMap", "91 C0", kNotMap}, WrongArgument{"takeMap", "91 01", kNotMap},
        WrongArgument{"takeMap", "91 A0", kNotMap}, WrongArgument{"takeList", "91 01", kNotList},
        WrongArgument{"takeList", "91 80", kNotList}, WrongArgument{"takeList", "91 91 A1 31", kNotList},
        WrongArgument{"takeList", "91 91 CB 3FF0000000000000", kNotList},
        WrongArgument{"takeList", "91 91 CF 8000000000000000", kNotList},
        WrongArgument{"takeList", "91 91 C0", "takeList: argument 1 (list) holds nil"},
        WrongArgument{"takeMap", "91 81 A1 61 C0", "takeMap: argument 1 (map) holds nil"},
        WrongArgument{"takeMap", "91 81 01 01", "takeMap: argument 1 (map) has a key that is not a text"},
        WrongArgument{"takeMap", "91 81 A1 61 C4 00", "takeMap: argument 1 (map) holds binary data"},
        WrongArgument{"takeMap", "91 81 A1 61 D4 07 00",
                      "takeMap: argument 1 (map) holds an extension other than a date"},
        WrongArgument{"takeMap", "91 81 A1 61 D4 FF 00", "takeMap: argument 1 (map) holds a malformed date"},
        WrongArgument{"takeMap", "91 81 A1 61 A1 FF",
                      "takeMap: argument 1 (map) holds text that is not UTF-8"},
        WrongArgument{"takeMap", "91 81 A1 FF 01", "takeMap: argument 1 (map) has a key that is not UTF-8"},
        WrongArgument{"takeTwo", "92 80 C4 00", "takeTwo: argument 2 (number) holds binary data"},
        WrongArgument{"takeInt64", "DC 0011 0000000000000000000000000000000000",
                      "takeInt64: argument 17 is one too many"}));

struct RightArgument {
  const char* method;
  const char* arguments;
};

class RightArgumentTest : public UnixSocketListenerTest, public testing::WithParamInterface<RightArgument> {};

TEST_P(RightArgumentTest, IsTaken) {
  RawClient client(path);
  const std::string method = GetParam().method;
  ASSERT_TRUE(client.send(fromHex("94 00 01") + static_cast<char>(0xA0 + method.size()) + method +
                          fromHex(GetParam().arguments)));
  const std::optional<RpcFrame> response = client.response();
  ASSERT_TRUE(response);
  EXPECT_FALSE(response->error) << response->error->text();
}

INSTANTIATE_TEST_SUITE_P(
    All, RightArgumentTest,
    testing::Values(RightArgument{"takeInt64", "91 D3 8000000000000000"},
                    RightArgument{"takeInt64", "91 CF 7FFFFFFFFFFFFFFF"},
                    RightArgument{"takeUInt32", "91 00"}, RightArgument{"takeUInt32", "91 CE FFFFFFFF"},
                    RightArgument{"takeUInt16", "91 D0 00"}, RightArgument{"takeUInt16", "91 CD FFFF"},
                    RightArgument{"takeMap", "91 80"}, RightArgument{"takeMap", "91 DF 00000001 A0 C2"},
                    RightArgument{"takeList", "91 C0"}, RightArgument{"takeList", "91 90"},
                    RightArgument{"takeList", "91 92 FF CF 7FFFFFFFFFFFFFFF"}));

TEST_F(UnixSocketListenerTest, CutsTheNameOfAnUnknownMethod) {
  RawClient client(path);
  // The cut would fall into the middle of the last character.
  ASSERT_TRUE(client.send(requestOf(1, std::string(63, 'm') + "\xC3\xBC" + "mm", {})));
  const std::optional<RpcFrame> response = client.response();
  ASSERT_TRUE(response && response->error && response->error->asMap());
  EXPECT_EQ(response->error->asMap()->integer("code"), kUnknownMethod);
  EXPECT_EQ(response->error->asMap()->text("message"), "unknown method " + std::string(63, 'm'));
  expectServed(client);
}

TEST_F(UnixSocketListenerTest, ReportsTheUnknownMethodRatherThanItsArguments) {
  RawClient client(path);
  ASSERT_TRUE(client.send(fromHex("94 00 01 A1 78 91 C4 00")));
  const std::optional<RpcFrame> response = client.response();
  ASSERT_TRUE(response && response->error && response->error->asMap());
  EXPECT_EQ(response->error->asMap()->integer("code"), kUnknownMethod);
}

// Tests a client whose user is neither the daemon's nor root. As root, the test connects from a thread of
// another user. As any other user, it gives the listener another owner instead.
class OtherUserTest : public UnixSocketListenerTest {
 protected:
  ~OtherUserTest() override { listener = nullptr; }  // before the accounts

  void SetUp() override {
    if (::geteuid() != 0) {
      listener = nullptr;  // frees the path
      std::string problem;
      listener = std::make_unique<UnixSocketListener>(ServerSocket::open(path, problem), category, foreign);
      listener->setDelegate(delegate);
    }
    listener->resume();
  }

  TestAccounts foreign{::geteuid() + 1};

  std::unique_ptr<RawClient> connectAsOtherUser() {
    if (::geteuid() != 0) return std::make_unique<RawClient>(path);
    EXPECT_EQ(::chmod(directory.path().c_str(), 0711), 0);
    EXPECT_EQ(::chmod(path.c_str(), 0666), 0);
    std::unique_ptr<RawClient> client;
    runAsOtherUser([&] { client = std::make_unique<RawClient>(path); });
    return client;
  }
};

TEST_F(OtherUserTest, IsRefusedTheOwnersMethodsAndServedTheOthers) {
  const auto client = connectAsOtherUser();
  ASSERT_TRUE(client->isConnected());
  ASSERT_TRUE(client->send(requestOf(1, "takeFromOwner", {Value(1)})));
  const std::optional<RpcFrame> response = client->response();
  ASSERT_TRUE(response && response->error && response->error->asMap());
  const ValueMap expected{{"domain", kMessagingErrorDomain},
                          {"code", 4},
                          {"message", "not permitted: takeFromOwner is for trusted users"}};
  EXPECT_EQ(*response->error->asMap(), expected) << response->error->text();
  EXPECT_THAT(record.requests(), IsEmpty());
  expectServed(*client);
}

TEST_F(OtherUserTest, IsNotPermittedEvenWithWrongArguments) {
  const auto client = connectAsOtherUser();
  ASSERT_TRUE(client->isConnected());
  ASSERT_TRUE(client->send(requestOf(1, "takeFromOwner", {Value("text")})));
  const std::optional<RpcFrame> response = client->response();
  ASSERT_TRUE(response && response->error && response->error->asMap());
  EXPECT_EQ(response->error->asMap()->integer("code"), kNotPermitted);
}

TEST_F(UnixSocketListenerTest, ServesRootTheMethodsOfAnyOwner) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can be root";
  listener = nullptr;
  TestAccounts foreign(12'345);
  std::string problem;
  listener = std::make_unique<UnixSocketListener>(ServerSocket::open(path, problem), category, foreign);
  listener->setDelegate(delegate);
  listener->resume();
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(1, "takeFromOwner", {Value(1)})));
  const std::optional<RpcFrame> response = client.response();
  ASSERT_TRUE(response);
  EXPECT_FALSE(response->error);
  listener = nullptr;  // before its accounts
}

TEST_F(UnixSocketListenerTest, EndsAConnectionThatSendsOtherBytesAndServesTheOthers) {
  RawClient good(path);
  RawClient bad(path);
  expectServed(good);
  ASSERT_TRUE(bad.send(requestOf(1, "takeInt64", {Value(5)}) + "GET / HTTP/1.1"));
  EXPECT_TRUE(bad.waitForEnd());
  EXPECT_THAT(errorLines(), ElementsAre(HasSubstr("something that is no array and is ended")));
  EXPECT_THAT(errorLines(), ElementsAre(HasSubstr("of process " + std::to_string(::getpid()))));
  // The request before those bytes was carried out.
  EXPECT_EQ(record.requests().back().arguments, Arguments{Value(5)});
  expectServed(good);
}

TEST_F(UnixSocketListenerTest, ServesItsClientsWhileAnotherProcessLocksTheSocketsDirectory) {
  RawClient client(path);
  expectServed(client);
  FileDescriptor otherLock(::open(directory.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  ASSERT_EQ(::flock(otherLock.get(), LOCK_EX | LOCK_NB), 0);
  std::filesystem::remove(path);
  listener->restoreSocket();
  // The second answer comes after the round in which the socket was to be recreated.
  expectServed(client);
  expectServed(client);
  EXPECT_THAT(errorLines(),
              ElementsAre("clients cannot connect: " + directory.path() + " is locked by another process"));

  otherLock.reset();
  listener->restoreSocket();
  expectServed(client);
  expectServed(client);
  RawClient next(path);
  expectServed(next);
}

TEST_F(UnixSocketListenerTest, EndsAConnectionThatSendsAResponse) {
  RawClient client(path);
  ASSERT_TRUE(client.send(fromHex("94 01 07 C0 C3")));
  EXPECT_TRUE(client.waitForEnd());
  EXPECT_THAT(errorLines(), ElementsAre(HasSubstr("sent a response and is ended")));
}

TEST_F(UnixSocketListenerTest, EndsAConnectionWhoseFrameIsTooLong) {
  RawClient client(path);
  // The other side stops reading before all of it is sent, so the send may fail.
  static_cast<void>(
      client.send(requestOf(1, "takeMap", {Value(ValueMap{{"text", std::string(kMaxFrameBytes, 'x')}})})));
  EXPECT_TRUE(client.waitForEnd());
  EXPECT_THAT(errorLines(), ElementsAre(HasSubstr("a frame that is too long")));
  EXPECT_THAT(record.requests(), IsEmpty());
}

TEST_F(UnixSocketListenerTest, LogsConnectionsAndTheirEndsAtInfoLevel) {
  {
    RawClient client(path);
    expectServed(client);
  }
  ASSERT_TRUE(record.waitForEvents(4));
  listener->shutDown();
  EXPECT_THAT(
      log.textsOf("twrs", LogLevel::kInfo),
      ElementsAre(HasSubstr("listening at " + path), HasSubstr("new connection"), HasSubstr("has ended")));
  EXPECT_THAT(errorLines(), IsEmpty());
}

TEST_F(UnixSocketListenerTest, RunsRequestsThatCameBeforeAHalfCloseAndThenEnds) {
  RawClient client(path);
  std::string frames;
  for (int at = 0; at < 500; ++at) frames += notificationOf("takeInt64", {Value(at)});
  ASSERT_TRUE(client.send(frames));
  client.shutDown(SHUT_WR);
  EXPECT_TRUE(client.waitForEnd());
  EXPECT_EQ(countedUp(), 500U);
  ASSERT_TRUE(record.waitForEvents(4));
  EXPECT_THAT(record.events(), ElementsAre("accepted", "interrupted", "invalidated", "object gone"));
}

TEST_F(UnixSocketListenerTest, SendsAnswersBeforeItEndsAfterAHalfClose) {
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(1, "echo", {Value(ValueMap{{"a", 1}})})));
  client.shutDown(SHUT_WR);
  const std::optional<RpcFrame> response = client.response();
  ASSERT_TRUE(response);
  EXPECT_EQ(response->result, Value(ValueMap{{"a", 1}}));
}

TEST_F(UnixSocketListenerTest, RunsRequestsOfAClientThatIsGoneBeforeTheyAreRead) {
  {
    RawClient client(path);
    std::string frames;
    for (int at = 0; at < 3000; ++at) frames += requestOf(1, "takeInt64", {Value(at)});
    ASSERT_TRUE(client.send(frames));
  }
  ASSERT_TRUE(record.waitForEvents(4));
  EXPECT_EQ(countedUp(), 3000U);
}

TEST_F(UnixSocketListenerTest, EndsWhenThePeerStopsReading) {
  RawClient client(path);
  ASSERT_TRUE(record.waitForEvents(1));
  client.shutDown(SHUT_RD);
  ASSERT_TRUE(client.send(requestOf(1, "takeInt64", {Value(0)})));
  ASSERT_TRUE(record.waitForEvents(4));
  EXPECT_THAT(record.events(), ElementsAre("accepted", "interrupted", "invalidated", "object gone"));
  EXPECT_EQ(countedUp(), 1U);
}

TEST_F(UnixSocketListenerTest, AnswersAsOftenAsTheObjectDoes) {
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(4, "answerTwice", {})));
  for (const int expected : {1, 2}) {
    const std::optional<RpcFrame> response = client.response();
    ASSERT_TRUE(response);
    EXPECT_EQ(response->identifier, 4U);
    EXPECT_EQ(response->result, Value(expected));
  }
}

TEST_F(UnixSocketListenerTest, ReadsNoFurtherThanTheBoundOfUnfinishedRequests) {
  RawClient client(path);
  constexpr std::size_t kSent = 2 * kMaxUnfinishedRequests + 100;
  std::string frames;
  for (std::size_t at = 0; at < kSent; ++at) frames += notificationOf("hold", {Value(at)});
  ASSERT_TRUE(client.send(frames));
  ASSERT_TRUE(record.waitForHeld(kMaxUnfinishedRequests));
  // The answer to another client shows that the thread has read all that it will read.
  RawClient other(path);
  expectServed(other);
  EXPECT_EQ(record.heldCount(), kMaxUnfinishedRequests);

  auto held = record.takeHeld();
  held.resize(kMaxUnfinishedRequests / 2);
  ASSERT_TRUE(record.waitForHeld(kMaxUnfinishedRequests / 2));
  expectServed(other);
  EXPECT_EQ(record.heldCount(), kMaxUnfinishedRequests / 2);
  held.clear();
  ASSERT_TRUE(record.waitForHeld(kMaxUnfinishedRequests));
  record.takeHeld().clear();
  EXPECT_TRUE(record.waitForHeld(100));
}

TEST_F(UnixSocketListenerTest, ReadsNoFurtherThanTheBoundOfUnfinishedBytes) {
  RawClient client(path);
  const std::string frame = notificationOf("holdMap", {Value(ValueMap{{"text", std::string(900'000, 'x')}})});
  std::thread sender([&] {
    for (int at = 0; at < 10; ++at) EXPECT_TRUE(client.send(frame));
  });
  // 4 of 900,000 bytes leave room for one more.
  ASSERT_TRUE(record.waitForHeld(5));
  RawClient other(path);
  expectServed(other);
  EXPECT_EQ(record.heldCount(), 5U);
  for (std::size_t taken = 0; taken < 10;) {
    ASSERT_TRUE(record.waitForHeld(1));
    taken += record.takeHeld().size();
  }
  sender.join();
}

TEST_F(UnixSocketListenerTest, CountsTheLargestAnswerFromTheRequestOn) {
  RawClient client(path);
  std::string frames;
  for (int at = 0; at < 20; ++at) frames += notificationOf("holdLarge", {});
  ASSERT_TRUE(client.send(frames));
  ASSERT_TRUE(record.waitForHeld(4));
  RawClient other(path);
  expectServed(other);
  EXPECT_EQ(record.heldCount(), 4U);
  for (std::size_t taken = 0; taken < 20;) {
    ASSERT_TRUE(record.waitForHeld(1));
    taken += record.takeHeld().size();
  }
}

TEST_F(UnixSocketListenerTest, DoesNotCountARequestWhoseReplyAloneIsHeldBack) {
  RawClient client(path);
  constexpr std::size_t kSent = 3 * kMaxUnfinishedRequests;
  std::string frames;
  for (std::size_t at = 0; at < kSent; ++at) frames += requestOf(1, "holdReply", {Value(at)});
  ASSERT_TRUE(client.send(frames));
  EXPECT_TRUE(record.waitForHeld(kSent));
}

TEST_F(UnixSocketListenerTest, StopsReadingAPeerThatNeverReadsItsReplies) {
  RawClient unread(path);
  const std::string frame = requestOf(1, "echo", {Value(ValueMap{{"text", std::string(500'000, 'x')}})});
  std::atomic<bool> isStopping = false;
  std::thread sender([&] {
    for (std::size_t at = 0; at < 1000 && !isStopping; ++at) {
      if (!unread.send(frame)) break;
    }
  });
  // Once unread replies fill the sockets and reach the bound, the connection is paused and no more requests
  // are read.
  constexpr std::size_t kUntilPaused = kMaxUnfinishedBytes / 500'000 + 1;
  ASSERT_TRUE(record.waitForRequests(kUntilPaused));
  RawClient other(path);
  expectServed(other);
  EXPECT_LE(record.requests().size(), kUntilPaused + 4);

  // Once it reads again it is served again.
  for (std::size_t at = 0; at < 2 * kUntilPaused; ++at) ASSERT_TRUE(unread.response());
  isStopping = true;
  unread.shutDown(SHUT_RDWR);
  sender.join();
}

TEST_F(UnixSocketListenerTest, EndsAPausedConnectionOnceItsRequestsHaveRun) {
  constexpr std::size_t kSent = kMaxUnfinishedRequests + 10;
  {
    RawClient client(path);
    std::string frames;
    for (std::size_t at = 0; at < kSent; ++at) frames += notificationOf("hold", {Value(at)});
    ASSERT_TRUE(client.send(frames));
    ASSERT_TRUE(record.waitForHeld(kMaxUnfinishedRequests));
  }
  EXPECT_THAT(record.events(), ElementsAre("accepted"));
  record.takeHeld().clear();
  ASSERT_TRUE(record.waitForEvents(4));
  EXPECT_EQ(countedUp(), kSent);
}

TEST_F(UnixSocketListenerTest, TakesRepliesFromManyThreads) {
  RawClient client(path);
  constexpr std::size_t kRequests = 800;
  std::string frames;
  for (std::uint32_t at = 0; at < kRequests; ++at) frames += requestOf(at, "hold", {Value(at)});
  ASSERT_TRUE(client.send(frames));
  ASSERT_TRUE(record.waitForHeld(kRequests));
  auto held = record.takeHeld();
  std::vector<std::thread> repliers;
  repliers.reserve(4);
  for (std::size_t first = 0; first < 4; ++first) {
    repliers.emplace_back([&held, first] {
      for (std::size_t at = first; at < held.size(); at += 4) held[at].first(std::nullopt, Value(at));
    });
  }
  std::vector<bool> isAnswered(kRequests);
  for (std::size_t at = 0; at < kRequests; ++at) {
    const std::optional<RpcFrame> response = client.response();
    ASSERT_TRUE(response);
    EXPECT_EQ(response->result, Value(response->identifier));
    isAnswered[response->identifier] = true;
  }
  for (std::thread& replier : repliers) replier.join();
  EXPECT_THAT(isAnswered, testing::Each(true));
}

TEST_F(UnixSocketListenerTest, ShutsDownWhileClientsSendAndAreAnswered) {
  std::vector<std::thread> clients;
  clients.reserve(4);
  for (int at = 0; at < 4; ++at) {
    clients.emplace_back([this] {
      RawClient client(path);
      while (client.send(requestOf(1, "takeInt64", {Value(1)})) && client.response()) {
      }
    });
  }
  ASSERT_TRUE(record.waitForRequests(100));
  listener->shutDown();
  for (std::thread& client : clients) client.join();
  EXPECT_FALSE(RawClient(path).isConnected());
  std::size_t accepted = 0;
  std::size_t gone = 0;
  for (const std::string& event : record.events()) {
    accepted += event == "accepted" ? 1 : 0;
    gone += event == "object gone" ? 1 : 0;
  }
  EXPECT_EQ(accepted, gone);
}

class UnresumedListenerTest : public UnixSocketListenerTest {
 protected:
  void SetUp() override {}
};

TEST_F(UnresumedListenerTest, ShutsDownWithoutEverHavingBeenResumed) {
  listener->shutDown();
  listener->resume();
  EXPECT_FALSE(RawClient(path).isConnected());
}

TEST_F(UnresumedListenerTest, ServesAClientThatConnectedBeforeItWasResumed) {
  RawClient client(path);
  ASSERT_TRUE(client.send(requestOf(99, "takeInt64", {Value(1)})));
  EXPECT_THAT(record.events(), IsEmpty());
  listener->resume();
  EXPECT_TRUE(client.response());
}

// Lowers the kernel's limit on descriptors, so that the tests can reach it.
class FewDescriptorsTest : public testing::Test {
 protected:
  static rlimit lowered(rlim_t count) {
    rlimit before{};
    ::getrlimit(RLIMIT_NOFILE, &before);
    rlimit few = before;
    few.rlim_cur = count;
    ::setrlimit(RLIMIT_NOFILE, &few);
    return before;
  }
  void TearDown() override { ::setrlimit(RLIMIT_NOFILE, &before_); }

  rlimit before_ = lowered(60);
  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  MemoryLog log;
  LogCategory category{log, "com.example", "twrs"};
  TestAccounts accounts;
  MessagingRecord record;
  RigDelegate delegate{record};
};

TEST_F(FewDescriptorsTest, LeavesHalfOfTheDescriptorsToTheDaemonAndLetsClientsWait) {
  std::string problem;
  UnixSocketListener listener(ServerSocket::open(path, problem), category, accounts);
  accounts->totals().setTotal(Resource::kConnections, 1000);  // so that one user may have all of them
  listener.setDelegate(delegate);
  listener.resume();
  ::setrlimit(RLIMIT_NOFILE, &before_);
  constexpr std::size_t kMax = 30;
  std::vector<std::unique_ptr<RawClient>> clients;
  for (std::size_t at = 0; at < kMax + 5; ++at) clients.push_back(std::make_unique<RawClient>(path));
  ASSERT_TRUE(record.waitForEvents(kMax));
  ASSERT_TRUE(clients.front()->send(requestOf(1, "takeInt64", {Value(1)})));
  ASSERT_TRUE(clients.front()->response());
  EXPECT_THAT(record.events(), SizeIs(kMax));

  // Each client that leaves makes room for one that waits.
  for (std::size_t at = 0; at < 5; ++at) clients[at]->close();
  ASSERT_TRUE(clients.back()->send(requestOf(1, "takeInt64", {Value(1)})));
  EXPECT_TRUE(clients.back()->response());
  listener.shutDown();
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError),
              ElementsAre(HasSubstr("cannot accept another client for now: too many clients")));
}

// Such a listener once served nobody, spun, and could not be ended.
TEST(UnixSocketListenerWithoutDescriptorsTest, SaysThatItCannotServe) {
  const TemporaryDirectory directory;
  MemoryLog log;
  const LogCategory category(log, "com.example", "twrs");
  TestAccounts accounts;
  for (const long number : {SYS_epoll_create1, SYS_eventfd2, SYS_epoll_ctl}) {
    SCOPED_TRACE(number);
    std::error_code problem;
    const auto make = [&] {
      std::string why;
      const UnixSocketListener listener(ServerSocket::open(directory.path("reporting.sock"), why), category,
                                        accounts);
      problem = listener.problem();
    };
    if (!runIntercepted(
            number, [](const seccomp_data&) { return EMFILE; }, make)) {
      GTEST_SKIP() << "system calls cannot be intercepted here";
    }
    EXPECT_EQ(problem, std::errc::too_many_files_open);
  }
}

// The kernel's answer is intercepted. With a real shortage the sanitizers, which need descriptors to read
// memory safely, would report correct code.
TEST(UnixSocketListenerShortageTest, PausesWhenTheSystemHasNoDescriptorAndLogsThatOnce) {
  std::atomic<bool> isShort = false;
  std::atomic<int> refused = 0;
  const auto answer = [&](const seccomp_data&) {
    if (!isShort) return 0;
    ++refused;
    return EMFILE;
  };
  const bool isTried = runIntercepted(SYS_accept4, answer, [&] {
    const TemporaryDirectory directory;
    const std::string path = directory.path("reporting.sock");
    MemoryLog log;
    const LogCategory category{log, "com.example", "twrs"};
    TestAccounts accounts;
    MessagingRecord record;
    RigDelegate delegate{record};
    std::string problem;
    UnixSocketListener listener(ServerSocket::open(path, problem), category, accounts);
    listener.setDelegate(delegate);
    listener.resume();
    RawClient first(path);
    ASSERT_TRUE(first.send(requestOf(1, "takeInt64", {Value(1)})));
    ASSERT_TRUE(first.response());

    isShort = true;
    RawClient second(path);
    ASSERT_TRUE(second.send(requestOf(1, "takeInt64", {Value(1)})));
    while (refused < 3) std::this_thread::yield();
    ASSERT_TRUE(first.send(requestOf(2, "takeInt64", {Value(1)})));
    EXPECT_TRUE(first.response());

    isShort = false;  // the second client is accepted after the pause
    EXPECT_TRUE(second.response());
    listener.shutDown();
    EXPECT_THAT(log.textsOf("twrs", LogLevel::kError),
                ElementsAre(HasSubstr("cannot accept another client for now")));
  });
  if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
}

TEST(UnixSocketListenerWatchdogTest, IsFedByTheMessagingThreadWithoutAnyClient) {
  const TemporaryDirectory directory;
  MemoryLog log;
  const LogCategory category{log, "com.example", "twrs"};
  const SystemClock clock;
  TestAccounts accounts;
  std::string problem;
  auto socket = ServerSocket::open(directory.path("reporting.sock"), problem);
  ASSERT_NE(socket, nullptr) << problem;
  constexpr int kEnough = 3;
  std::atomic<int> pings = 0;
  std::promise<void> enough;
  auto feeder = std::make_unique<WatchdogFeeder>(1ms, clock, [&] {
    if (++pings == kEnough) enough.set_value();
  });
  UnixSocketListener listener(std::move(socket), category, accounts, std::move(feeder));
  MessagingRecord record;
  RigDelegate delegate(record);
  listener.setDelegate(delegate);
  listener.resume();
  EXPECT_EQ(enough.get_future().wait_for(kPatience), std::future_status::ready);
}

}  // namespace
}  // namespace tonewerk
