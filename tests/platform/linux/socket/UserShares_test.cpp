// SPDX-License-Identifier: Apache-2.0
#include <chrono>
#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <string>
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
using testing::SizeIs;
using namespace std::chrono_literals;

bool becomesTrue(const std::function<bool()>& condition) {
  const auto end = std::chrono::steady_clock::now() + 30s;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > end) return false;
    std::this_thread::sleep_for(1ms);
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
  ASSERT_EQ(::chmod(directory.path().c_str(), 0711), 0);
  ASSERT_EQ(::chmod(path.c_str(), 0666), 0);
  std::unique_ptr<RawClient> other;
  runAsOtherUser([&] { other = std::make_unique<RawClient>(path); });
  EXPECT_TRUE(isServed(*other));
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
  std::vector<std::unique_ptr<RawClient>> clients;
  for (int number = 0; number < 6; ++number) clients.push_back(std::make_unique<RawClient>(path));
  std::vector<std::thread> senders;
  for (const auto& client : clients) senders.emplace_back([&] { EXPECT_TRUE(client->send(frame)); });
  for (const auto& client : clients) EXPECT_TRUE(client->response());
  for (std::thread& sender : senders) sender.join();
  EXPECT_THAT(record.requests(), SizeIs(6));
  EXPECT_TRUE(becomesTrue([&] { return account->held(Resource::kReadBytes) == 0; }));
}

TEST_F(UserSharesTest, AFrameThatNeverEndsLetsAnotherOneOnceItsConnectionHasGone) {
  accounts->totals().setTotal(Resource::kReadBytes, 400'000);
  const std::string frame = request(Value(ValueMap{{"text", std::string(700'000, 'x')}}), "takeMap");
  std::optional<RawClient> stuck(path);
  ASSERT_TRUE(stuck->send(frame.substr(0, 600'000)));
  ASSERT_TRUE(becomesTrue([&] { return account->held(Resource::kReadBytes) >= 600'000; }));
  RawClient other(path);
  std::thread sender([&] { EXPECT_TRUE(other.send(frame)); });
  stuck.reset();
  EXPECT_TRUE(other.response());
  sender.join();
}

TEST_F(UserSharesTest, AUserWithoutRoomForRequestsIsNotReadUntilThereIsSome) {
  const std::uint64_t all = accounts->totals().total(Resource::kUnfinishedBytes);
  RawClient client(path);
  ASSERT_TRUE(isServed(client));
  account->charge(Resource::kUnfinishedBytes, all);
  ASSERT_TRUE(client.send(request(Value(5))));
  RawClient other(path);
  ASSERT_TRUE(other.send(request(Value(6))));
  EXPECT_TRUE(becomesTrue([&] { return account->held(Resource::kConnections) == 2; }));
  EXPECT_THAT(record.requests(), SizeIs(1));
  account->give(Resource::kUnfinishedBytes, all);
  EXPECT_TRUE(client.response());
  EXPECT_TRUE(other.response());
}

}  // namespace
}  // namespace tonewerk
