// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messaging/RequestWindow.h"

#include <gmock/gmock.h>
#include <memory>
#include <thread>
#include <vector>

#include "platform/linux/messagepack/RpcLimits.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::uint64_t kConnection = 9;

class RequestWindowTest : public testing::Test {
 protected:
  std::vector<InFlightToken> start(std::size_t count, std::size_t bytes) {
    std::vector<InFlightToken> tokens;
    for (std::size_t at = 0; at < count; ++at) tokens.push_back(window->start(bytes));
    return tokens;
  }

  std::shared_ptr<IoWaker> waker = std::make_shared<IoWaker>();
  std::shared_ptr<RequestWindow> window = std::make_shared<RequestWindow>(waker, kConnection);
};

TEST_F(RequestWindowTest, HasRoomUntilTheBoundOfRequestsIsReached) {
  auto tokens = start(kMaxUnfinishedRequests - 1, 1);
  EXPECT_TRUE(window->hasRoom(0));
  tokens.push_back(window->start(1));
  EXPECT_FALSE(window->hasRoom(0));
}

TEST_F(RequestWindowTest, HasRoomUntilTheBoundOfBytesIsReached) {
  auto tokens = start(1, kMaxUnfinishedBytes - 1);
  EXPECT_TRUE(window->hasRoom(0));
  tokens.push_back(window->start(1));
  EXPECT_FALSE(window->hasRoom(0));
}

TEST_F(RequestWindowTest, CountsTheBytesOfUnreadRepliesToo) {
  const auto tokens = start(1, 1000);
  EXPECT_TRUE(window->hasRoom(kMaxUnfinishedBytes - 1001));
  EXPECT_FALSE(window->hasRoom(kMaxUnfinishedBytes - 1000));
}

TEST_F(RequestWindowTest, HasNoRoomWhenRepliesAloneReachTheBound) {
  EXPECT_TRUE(window->hasRoom(kMaxUnfinishedBytes - 1));
  EXPECT_FALSE(window->hasRoom(kMaxUnfinishedBytes));
}

TEST_F(RequestWindowTest, SeesFinishedRequestsWithoutBeingWoken) {
  auto tokens = start(kMaxUnfinishedRequests, 1);
  tokens.clear();
  EXPECT_TRUE(window->hasRoom(0));
  EXPECT_THAT(waker->take(), IsEmpty());
}

TEST_F(RequestWindowTest, WakesTheConnectionOnceWhenHalfHasFinished) {
  auto tokens = start(kMaxUnfinishedRequests, 1);
  ASSERT_FALSE(window->hasRoom(0));
  tokens.resize(kMaxUnfinishedRequests / 2 + 1);
  EXPECT_THAT(waker->take(), IsEmpty());
  tokens.pop_back();
  EXPECT_THAT(waker->take(), ElementsAre(kConnection));
  EXPECT_TRUE(window->hasRoom(0));
  tokens.clear();
  EXPECT_THAT(waker->take(), IsEmpty());
}

TEST_F(RequestWindowTest, WakesTheConnectionForASingleLargeRequest) {
  auto tokens = start(1, kMaxUnfinishedBytes);
  ASSERT_FALSE(window->hasRoom(0));
  tokens.clear();
  EXPECT_THAT(waker->take(), ElementsAre(kConnection));
  EXPECT_TRUE(window->hasRoom(0));
}

// A request may finish after hasRoom() has read the counters and before it asks to be woken. If that were
// missed, the connection would never be read again.
TEST_F(RequestWindowTest, NeverMissesTheLastFinishOnAnotherThread) {
  for (int round = 0; round < 300; ++round) {
    auto tokens = start(kMaxUnfinishedRequests, 1);
    std::thread finisher([tokens = std::move(tokens)]() mutable { tokens.clear(); });
    const bool hadRoom = window->hasRoom(0);
    finisher.join();
    ASSERT_TRUE(hadRoom || !waker->take().empty());
    ASSERT_TRUE(window->hasRoom(0));
    static_cast<void>(waker->take());  // drops this round's wakes
  }
}

TEST_F(RequestWindowTest, CountsWhatFinishesInABatchAtItsEnd) {
  auto tokens = start(kMaxUnfinishedRequests, 1);
  EXPECT_FALSE(window->hasRoom(0));
  {
    const RequestWindow::Batch batch(*window);
    tokens.clear();
    EXPECT_THAT(waker->take(), IsEmpty());
  }
  EXPECT_THAT(waker->take(), ElementsAre(kConnection));
  EXPECT_TRUE(window->hasRoom(kMaxUnfinishedBytes - 1));  // the bytes are counted, too
  tokens = start(kMaxUnfinishedRequests, 1);
  EXPECT_FALSE(window->hasRoom(0));
}

TEST_F(RequestWindowTest, ABatchIsOfOneWindowAndOneThread) {
  const auto other = std::make_shared<RequestWindow>(waker, kConnection + 1);
  InFlightToken large = other->start(kMaxUnfinishedBytes);
  std::vector<InFlightToken> tokens = start(kMaxUnfinishedRequests, 1);
  EXPECT_FALSE(other->hasRoom(0));
  EXPECT_FALSE(window->hasRoom(0));
  const RequestWindow::Batch batch(*window);
  large = {};
  EXPECT_THAT(waker->take(), ElementsAre(kConnection + 1));
  std::thread([&] { tokens.clear(); }).join();
  EXPECT_THAT(waker->take(), ElementsAre(kConnection));
}

}  // namespace
}  // namespace tonewerk
