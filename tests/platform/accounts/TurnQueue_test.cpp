// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/TurnQueue.h"

#include <algorithm>
#include <chrono>
#include <gtest/gtest.h>
#include <map>
#include <random>
#include <string>
#include <vector>

#include "platform/accounts/Accounts.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualQueues.h"
#include "support/manual/ManualTimers.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using Progress = TurnQueue::Progress;

class TurnQueueTest : public testing::Test {
 protected:
  void TearDown() override { turns->close(); }

  // A piece that takes `time` in one go.
  void add(const std::shared_ptr<Account>& account, std::string name, std::chrono::nanoseconds time = 0ns) {
    turns->add(account, [this, name = std::move(name), time] {
      clock.advance(time);
      ran.push_back(name);
      return Progress::kDone;
    });
  }

  ManualClock clock;
  ManualQueues queues;
  ManualTimers timers{clock};
  Accounts accounts{990, clock};
  std::shared_ptr<Account> anna = accounts.of(1001);
  std::shared_ptr<Account> ben = accounts.of(1002);
  std::unique_ptr<SerialQueue> queue = queues.makeSerialQueue("work", QueuePriority::kUtility);
  std::shared_ptr<TurnQueue> turns = std::make_shared<TurnQueue>(*queue, clock, timers);
  std::vector<std::string> ran;
};

using Names = std::vector<std::string>;

TEST_F(TurnQueueTest, OneUsersPiecesRunInOrder) {
  for (const char* name : {"a1", "a2", "a3"}) add(anna, name, 5ms);
  queues.runAll();
  EXPECT_EQ(ran, (Names{"a1", "a2", "a3"}));
}

TEST_F(TurnQueueTest, UsersWithShortPiecesGetATurnEach) {
  for (const char* name : {"a1", "a2", "a3"}) add(anna, name, 600us);
  for (const char* name : {"b1", "b2", "b3"}) add(ben, name, 600us);
  queues.runAll();
  EXPECT_EQ(ran, (Names{"a1", "a2", "b1", "b2", "a3", "b3"}));
}

TEST_F(TurnQueueTest, AUserWhosePieceTookLongPaysInTheNextRounds) {
  add(anna, "a1", 4ms);
  add(anna, "a2", 1ms);
  for (const char* name : {"b1", "b2", "b3", "b4", "b5"}) add(ben, name, 1ms);
  queues.runAll();
  EXPECT_EQ(ran, (Names{"a1", "b1", "b2", "b3", "b4", "a2", "b5"}));
}

TEST_F(TurnQueueTest, ManyPiecesOfOneUserDoNotHoldUpAnother) {
  for (int number = 0; number < 1000; ++number) add(anna, "a", 1ms);
  add(ben, "b");
  queues.runAll();
  EXPECT_LE(std::find(ran.begin(), ran.end(), "b") - ran.begin(), 1);
}

TEST_F(TurnQueueTest, ALongPieceGoesOnInTheNextTurn) {
  int slices = 0;
  turns->add(anna, [&, this] {
    while (slices < 30) {
      clock.advance(100us);
      ++slices;
      if (turns->isTurnOver()) return ran.push_back("slice"), Progress::kMore;
    }
    return ran.push_back("end"), Progress::kDone;
  });
  add(anna, "a2");
  for (const char* name : {"b1", "b2"}) add(ben, name, 1ms);
  queues.runAll();
  EXPECT_EQ(ran, (Names{"slice", "b1", "slice", "b2", "end", "a2"}));
}

TEST_F(TurnQueueTest, ALongPieceOfTheOnlyUserIsNotInterrupted) {
  turns->add(anna, [this] {
    clock.advance(1s);
    EXPECT_FALSE(turns->isTurnOver());
    EXPECT_TRUE(turns->isTurnOverAfterLongStep());
    return Progress::kDone;
  });
  queues.runAll();
}

TEST_F(TurnQueueTest, AContinuationRunsBeforeTheRestOfItsPiece) {
  int calls = 0;
  turns->add(anna, [&, this] {
    if (++calls == 2) return ran.push_back("rest"), Progress::kDone;
    TurnQueue::Piece first = [this] { return ran.push_back("first"), Progress::kDone; };
    EXPECT_TRUE(turns->continueFirst(first));
    EXPECT_TRUE(turns->isTurnOver());
    return Progress::kMore;
  });
  add(anna, "a2");
  queues.runAll();
  EXPECT_EQ(ran, (Names{"first", "rest", "a2"}));
}

TEST_F(TurnQueueTest, OutsideOfPiecesThereIsNoTurn) {
  TurnQueue::Piece piece = [] { return Progress::kDone; };
  EXPECT_FALSE(turns->continueFirst(piece));
  EXPECT_TRUE(static_cast<bool>(piece));
  EXPECT_FALSE(turns->isTurnOver());
}

TEST_F(TurnQueueTest, AUserWithoutRoomForReportsWaitsUntilSomeAreWritten) {
  anna->charge(Resource::kSinkBytes, 16 * kMiB);
  add(anna, "a");
  add(ben, "b");
  queues.runAll();
  EXPECT_EQ(ran, Names{"b"});
  anna->give(Resource::kSinkBytes, 15 * kMiB);
  queues.runAll();
  EXPECT_EQ(ran, (Names{"b", "a"}));
}

TEST_F(TurnQueueTest, APieceThatFillsASinkStopsThere) {
  bool isFirst = true;
  turns->add(anna, [&, this] {
    ran.push_back("slice");
    if (!std::exchange(isFirst, false)) return Progress::kDone;
    anna->charge(Resource::kSinkBytes, 16 * kMiB);
    EXPECT_TRUE(turns->isTurnOver());
    return Progress::kMore;
  });
  queues.runAll();
  EXPECT_EQ(ran, Names{"slice"});
  anna->give(Resource::kSinkBytes, 16 * kMiB);
  queues.runAll();
  EXPECT_EQ(ran, (Names{"slice", "slice"}));
}

TEST_F(TurnQueueTest, ASinkThatWritesNothingHoldsAUserForALimitedTime) {
  anna->charge(Resource::kSinkBytes, 16 * kMiB);
  add(anna, "a1");
  queues.runAll();
  EXPECT_TRUE(ran.empty());
  clock.advance(TurnQueue::kLongestWait);
  queues.runAll();
  EXPECT_EQ(ran, Names{"a1"});
  add(anna, "a2");
  queues.runAll();
  EXPECT_EQ(ran, (Names{"a1", "a2"}));

  anna->give(Resource::kSinkBytes, 16 * kMiB);  // it writes again
  anna->charge(Resource::kSinkBytes, 16 * kMiB);
  add(anna, "a3");
  queues.runAll();
  EXPECT_EQ(ran, (Names{"a1", "a2"}));
  anna->give(Resource::kSinkBytes, 16 * kMiB);
  queues.runAll();
  EXPECT_EQ(ran, (Names{"a1", "a2", "a3"}));
}

TEST_F(TurnQueueTest, WorkRunsForItsUser) {
  for (const auto& user : {anna, ben}) {
    turns->add(user, [this, user] {
      EXPECT_EQ(WorkingFor::account(), user);
      ran.push_back("work");
      return Progress::kDone;
    });
  }
  queues.runAll();
  EXPECT_EQ(ran.size(), 2U);
  EXPECT_EQ(WorkingFor::account(), nullptr);
}

TEST_F(TurnQueueTest, TheEndRunsWhatWaitsForRoom) {
  anna->charge(Resource::kSinkBytes, 16 * kMiB);
  add(anna, "a1");
  add(anna, "a2");
  queues.runAll();
  turns->finish();
  EXPECT_EQ(ran, (Names{"a1", "a2"}));
  anna->give(Resource::kSinkBytes, 16 * kMiB);
}

TEST_F(TurnQueueTest, AtTheEndVeryLongPiecesAreAskedToGiveUp) {
  int slices = 0;
  turns->add(anna, [&, this] {
    clock.advance(1s);
    ++slices;
    return turns->mustGiveUp() ? Progress::kDone : Progress::kMore;
  });
  EXPECT_FALSE(turns->mustGiveUp());
  turns->finish();
  EXPECT_TRUE(turns->mustGiveUp());
}

TEST_F(TurnQueueTest, NothingRunsAfterClose) {
  add(anna, "a1");
  turns->close();
  add(anna, "a2");
  queues.runAll();
  EXPECT_TRUE(ran.empty());
}

TEST_F(TurnQueueTest, RandomWorkKeepsEachUsersOrderAndSharesTheTime) {
  std::mt19937 random(15);
  std::map<Account*, int> next;
  std::map<Account*, std::chrono::nanoseconds> times;
  std::chrono::nanoseconds difference{0};
  const std::vector<std::shared_ptr<Account>> users{anna, ben, accounts.of(1003)};
  for (const auto& user : users) {
    for (int number = 0; number < 2000; ++number) {
      const std::chrono::microseconds time(user == anna ? random() % 5000 : random() % 1000);
      turns->add(user, [&, time, number, account = user.get()] {
        EXPECT_EQ(next[account]++, number);
        clock.advance(time);
        times[account] += time;
        if (times[anna.get()] + times[ben.get()] < 500ms) {
          difference = std::chrono::abs(times[anna.get()] - times[ben.get()]);
        }
        return Progress::kDone;
      });
    }
  }
  queues.runAll();
  for (const auto& user : users) EXPECT_EQ(next[user.get()], 2000);
  // While all had work, they had the same time but for a turn and a piece.
  EXPECT_LT(difference, 8ms);
  EXPECT_GT(times[anna.get()], 4s);
}

}  // namespace
}  // namespace tonewerk
