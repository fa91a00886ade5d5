// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <chrono>
#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/messaging/MessagingRig.h"
#include "platform/linux/socket/RawClient.h"
#include "platform/linux/socket/UnixSocketListener.h"
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

bool becomesTrue(const std::function<bool()>& condition) {
  const auto end = std::chrono::steady_clock::now() + 30s;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > end) return false;
    std::this_thread::yield();
  }
  return true;
}

class UserSharesTest : public testing::Test {
 protected:
  UserSharesTest() {
    std::string problem;
    auto socket = ServerSocket::open(path, problem);
    EXPECT_NE(socket, nullptr) << problem;
    listener = std::make_unique<UnixSocketListener>(std::move(socket), category, accounts);
    listener->setDelegate(delegate);
    listener->resume();
  }

  static std::string request(const Value& argument, std::string_view method = "takeInt64") {
    std::string frame;
    RpcWriter(frame).request(7, method, {argument});
    return frame;
  }
  static bool isServed(RawClient& client) {
    return client.send(request(Value(1))) && client.response().has_value();
  }

  // Only for root.
  std::unique_ptr<RawClient> connectAsOther() {
    EXPECT_EQ(::chmod(directory.path().c_str(), 0711), 0);
    EXPECT_EQ(::chmod(path.c_str(), 0666), 0);
    std::unique_ptr<RawClient> other;
    runAsOtherUser([&] { other = std::make_unique<RawClient>(path); });
    return other;
  }

  // A client, and what it has still to send.
  struct Sending {
    std::unique_ptr<RawClient> client;
    std::string_view left;
  };
  // Sends for each until the sockets are full and nobody has read from them for a while.
  static void sendWhatIsRead(std::vector<Sending>& sendings) {
    for (int triesWithout = 0; triesWithout < 100; ++triesWithout) {
      for (Sending& sending : sendings) {
        if (sending.left.empty()) continue;
        const std::size_t count = sending.client->sendWithoutWaiting(sending.left);
        sending.left.remove_prefix(count);
        if (count > 0) triesWithout = 0;
      }
      std::this_thread::sleep_for(1ms);
    }
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  MemoryLog log;
  LogCategory category{log, "com.example", "twrs"};
  TestAccounts accounts;
  const std::shared_ptr<Account> account = accounts->of(::geteuid());
  MessagingRecord record;
  RigDelegate delegate{record};
  std::unique_ptr<UnixSocketListener> listener;
};

TEST_F(UserSharesTest, AConnectionAboveItsUsersShareIsClosedAtOnce) {
  accounts->totals().setTotal(Resource::kConnections, 4);
  std::vector<std::unique_ptr<RawClient>> clients;
  for (int number = 0; number < 2; ++number) {
    clients.push_back(std::make_unique<RawClient>(path));
    EXPECT_TRUE(isServed(*clients.back()));
  }
  RawClient further(path);
  EXPECT_TRUE(further.waitForEnd());
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError),
              ElementsAre(HasSubstr(" has 2 connections and gets no more: process " +
                                    std::to_string(::getpid()) + " is turned away")));
  EXPECT_EQ(account->refused(Resource::kConnections), 1U);
  clients.pop_back();
  ASSERT_TRUE(becomesTrue([&] { return account->held(Resource::kConnections) == 1; }));
  RawClient next(path);
  EXPECT_TRUE(isServed(next));
}

TEST_F(UserSharesTest, AnotherUserStillConnects) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can connect as another user";
  accounts->totals().setTotal(Resource::kConnections, 4);
  RawClient first(path);
  RawClient second(path);
  EXPECT_TRUE(isServed(first) && isServed(second));
  EXPECT_TRUE(isServed(*connectAsOther()));
}

TEST_F(UserSharesTest, WhatUnfinishedFramesHoldIsChargedAndGivenBack) {
  const std::string frame = request(Value(ValueMap{{"text", std::string(500'000, 'x')}}), "takeMap");
  RawClient complete(path);
  std::optional<RawClient> broken(path);
  for (RawClient* client : {&complete, &*broken}) ASSERT_TRUE(client->send(frame.substr(0, 400'000)));
  ASSERT_TRUE(becomesTrue([&] { return account->held(Resource::kReadBytes) >= 800'000; }));
  broken.reset();
  ASSERT_TRUE(becomesTrue([&] { return account->held(Resource::kReadBytes) < 800'000; }));
  ASSERT_TRUE(complete.send(frame.substr(400'000)));
  EXPECT_TRUE(complete.response());
  EXPECT_TRUE(becomesTrue([&] { return account->held(Resource::kReadBytes) == 0; }));
}

TEST_F(UserSharesTest, FramesAboveTheShareAreReadOneAfterTheOther) {
  accounts->totals().setTotal(Resource::kReadBytes, 400'000);
  const std::string frame = request(Value(ValueMap{{"text", std::string(700'000, 'x')}}), "takeMap");
  std::vector<Sending> sendings(6);
  for (Sending& sending : sendings) {
    sending.client = std::make_unique<RawClient>(path);
    sending.left = std::string_view(frame).substr(0, frame.size() - 1);
  }
  for (std::size_t done = 0; done < 6; ++done) {
    sendWhatIsRead(sendings);
    EXPECT_LT(account->held(Resource::kReadBytes), 3 * frame.size());
    const auto isNext = [](const Sending& sending) { return sending.left.empty() && sending.client; };
    ASSERT_EQ(std::count_if(sendings.begin(), sendings.end(), isNext), 1);
    Sending& next = *std::find_if(sendings.begin(), sendings.end(), isNext);
    ASSERT_TRUE(next.client->send(frame.substr(frame.size() - 1)));
    EXPECT_TRUE(next.client->response());
    next.client.reset();
  }
  EXPECT_THAT(record.requests(), SizeIs(6));
  EXPECT_TRUE(becomesTrue([&] { return account->held(Resource::kReadBytes) == 0; }));
}

TEST_F(UserSharesTest, AFrameThatNeverEndsLetsAnotherOneOnceItsConnectionHasGone) {
  accounts->totals().setTotal(Resource::kReadBytes, 400'000);
  const std::string frame = request(Value(ValueMap{{"text", std::string(700'000, 'x')}}), "takeMap");
  std::optional<RawClient> stuck(path);
  ASSERT_TRUE(stuck->send(frame.substr(0, 600'000)));
  ASSERT_TRUE(becomesTrue([&] { return account->held(Resource::kReadBytes) >= 600'000; }));
  std::vector<Sending> sendings(1);
  Sending& other = sendings.front();
  other.client = std::make_unique<RawClient>(path);
  other.left = frame;
  sendWhatIsRead(sendings);
  EXPECT_FALSE(other.left.empty());
  EXPECT_THAT(record.requests(), IsEmpty());
  stuck.reset();
  EXPECT_TRUE(other.client->send(other.left));
  EXPECT_TRUE(other.client->response());
}

TEST_F(UserSharesTest, AUserWithoutRoomForRequestsIsNotReadUntilThereIsSome) {
  if (::geteuid() != 0) GTEST_SKIP() << "only root can connect as another user";
  const std::unique_ptr<RawClient> another = connectAsOther();
  const std::uint64_t all = accounts->totals().total(Resource::kUnfinishedBytes);
  RawClient client(path);
  ASSERT_TRUE(isServed(client));
  account->charge(Resource::kUnfinishedBytes, all);
  ASSERT_TRUE(client.send(request(Value(5))));
  RawClient other(path);
  ASSERT_TRUE(other.send(request(Value(6))));
  EXPECT_TRUE(becomesTrue([&] { return account->held(Resource::kConnections) == 2; }));
  // Whoever has a turn after these two has seen that they were looked at.
  constexpr int kRoundTrips = 10;
  for (int number = 0; number < kRoundTrips; ++number) ASSERT_TRUE(isServed(*another));
  EXPECT_THAT(record.requests(), SizeIs(1 + kRoundTrips));
  account->give(Resource::kUnfinishedBytes, all);
  EXPECT_TRUE(client.response());
  EXPECT_TRUE(other.response());
}

}  // namespace
}  // namespace tonewerk
