// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/Account.h"

#include <gtest/gtest.h>
#include <optional>
#include <thread>
#include <vector>

#include "platform/accounts/Accounts.h"
#include "platform/accounts/WorkingFor.h"
#include "protocol/RequestSet.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

constexpr Resource kKept = Resource::kKeptBytes;
constexpr std::uint32_t kOwner = 990;

// Of so many lines, those that may be written.
int linesOf(LineAllowance& lines, int count) {
  int written = 0;
  for (int line = 0; line < count; ++line) written += lines.takeLine() ? 1 : 0;
  return written;
}

class AccountTest : public testing::Test {
 protected:
  AccountTest() { accounts.totals().setTotal(kKept, 1000); }

  ManualClock clock;
  Accounts accounts{kOwner, clock};
  std::shared_ptr<Account> first = accounts.of(1001);
  std::shared_ptr<Account> second = accounts.of(1002);
};

TEST_F(AccountTest, OneUserGetsHalfOfTheTotal) {
  EXPECT_TRUE(first->take(kKept, 500));
  EXPECT_FALSE(first->take(kKept, 1));
  EXPECT_EQ(first->held(kKept), 500U);
  EXPECT_EQ(first->refused(kKept), 1U);
}

TEST_F(AccountTest, TheNextUserGetsHalfOfWhatIsLeft) {
  ASSERT_TRUE(first->take(kKept, 500));
  EXPECT_EQ(second->share(kKept), 250U);
  EXPECT_TRUE(second->take(kKept, 250));
  EXPECT_FALSE(second->take(kKept, 1));
  EXPECT_EQ(accounts.totals().held(kKept), 750U);
}

TEST_F(AccountTest, AUserWhoHoldsNothingGetsAPieceWhileTheTotalHasRoom) {
  ASSERT_TRUE(first->take(kKept, 500));
  EXPECT_TRUE(second->take(kKept, 400));
  EXPECT_FALSE(accounts.of(1003)->take(kKept, 101));
  EXPECT_TRUE(accounts.of(1003)->take(kKept, 100));
}

TEST_F(AccountTest, WhatIsGivenBackCanBeTakenAgain) {
  ASSERT_TRUE(first->take(kKept, 500));
  first->give(kKept, 200);
  EXPECT_TRUE(first->take(kKept, 200));
}

TEST_F(AccountTest, AChargeWithinTheShareTakesItsAmountOnceAndNothingAboveTheShare) {
  {
    const std::optional<Charge> charge = Charge::withinShare(first, kKept, 300);
    ASSERT_TRUE(charge);
    EXPECT_EQ(charge->amount(), 300U);
    EXPECT_EQ(first->held(kKept), 300U);
    EXPECT_FALSE(Charge::withinShare(first, kKept, 201));
    EXPECT_EQ(first->held(kKept), 300U);
    EXPECT_EQ(first->refused(kKept), 1U);
  }
  EXPECT_EQ(first->held(kKept), 0U);
  EXPECT_EQ(accounts.totals().held(kKept), 0U);
}

TEST_F(AccountTest, AChargeIsTakenWhateverTheShare) {
  {
    const Charge charge(first, kKept, 5000);
    EXPECT_EQ(first->held(kKept), 5000U);
    EXPECT_FALSE(first->hasRoom(kKept));
  }
  EXPECT_EQ(first->held(kKept), 0U);
  EXPECT_TRUE(first->hasRoom(kKept));
}

TEST_F(AccountTest, AMovedChargeIsGivenBackOnce) {
  Charge charge(first, kKept, 10);
  Charge moved(std::move(charge));
  Charge other(second, kKept, 7);
  other = std::move(moved);
  EXPECT_EQ(second->held(kKept), 0U);
  EXPECT_EQ(first->held(kKept), 10U);
  other.setTo(4);
  EXPECT_EQ(first->held(kKept), 4U);
  other.setTo(6);
  EXPECT_EQ(first->held(kKept), 6U);
}

TEST_F(AccountTest, WhoWaitsForRoomIsCalledOnceThereIsSome) {
  first->charge(kKept, 600);
  int calls = 0;
  first->whenRoom(kKept, [&] { ++calls; });
  EXPECT_EQ(calls, 0);
  first->give(kKept, 50);
  EXPECT_EQ(calls, 0);
  first->give(kKept, 100);
  EXPECT_EQ(calls, 1);
  first->give(kKept, 100);
  EXPECT_EQ(calls, 1);
}

TEST_F(AccountTest, WhoWaitsWhileThereIsRoomIsCalledAtOnce) {
  int calls = 0;
  first->whenRoom(kKept, [&] { ++calls; });
  EXPECT_EQ(calls, 1);
}

TEST_F(AccountTest, AllThatIsTakenOnManyThreadsIsGivenBack) {
  std::vector<std::thread> threads;
  for (const auto& account : {first, second}) {
    for (int number = 0; number < 2; ++number) {
      threads.emplace_back([account] {
        for (int round = 0; round < 10'000; ++round) {
          if (account->take(kKept, 100)) account->give(kKept, 100);
        }
      });
    }
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(first->held(kKept), 0U);
  EXPECT_EQ(second->held(kKept), 0U);
  EXPECT_EQ(accounts.totals().held(kKept), 0U);
}

TEST_F(AccountTest, RootTheOwnerAndTheTrustedUsersAreTrusted) {
  accounts.setTrustedUsers({1002, kNoUser});
  EXPECT_TRUE(accounts.of(0)->isTrusted());
  EXPECT_TRUE(accounts.of(kOwner)->isTrusted());
  EXPECT_TRUE(second->isTrusted());
  EXPECT_FALSE(first->isTrusted());
  EXPECT_FALSE(accounts.of(kNoUser)->isTrusted());
  accounts.setTrustedUsers({1001});
  EXPECT_TRUE(first->isTrusted());
  EXPECT_FALSE(second->isTrusted());
}

TEST_F(AccountTest, AUserHasOneAccount) {
  EXPECT_EQ(accounts.of(1001), first);
  EXPECT_EQ(accounts.own()->user(), kOwner);
}

TEST_F(AccountTest, UsersBeyondTheBoundShareAnAccount) {
  for (std::uint32_t user = 2000; user < 2000 + Accounts::kMaxAccounts; ++user) (void)accounts.of(user);
  EXPECT_EQ(accounts.of(100'000)->user(), kNoUser);
  EXPECT_EQ(accounts.of(1001), first);
  EXPECT_LE(accounts.all().size(), Accounts::kMaxAccounts + 1);
}

TEST_F(AccountTest, TheInnermostScopeSaysForWhomAThreadWorks) {
  EXPECT_EQ(WorkingFor::account(), nullptr);
  EXPECT_EQ(WorkingFor::lines(), nullptr);
  const WorkingFor outer(first);
  {
    LineAllowance lines(clock, {.burst = 1, .perSecond = 1});
    const WorkingFor inner(second, &lines);
    EXPECT_EQ(WorkingFor::account(), second);
    EXPECT_EQ(WorkingFor::lines(), &lines);
    std::thread([] { EXPECT_EQ(WorkingFor::accountIfAny(), nullptr); }).join();
  }
  EXPECT_EQ(WorkingFor::account(), first);
  EXPECT_EQ(WorkingFor::lines(), &first->lines());
}

TEST_F(AccountTest, LinesBeyondTheAllowanceAreHeldBackAndCounted) {
  LineAllowance lines(clock, {.burst = 3, .perSecond = 2});
  EXPECT_EQ(linesOf(lines, 5), 3);
  clock.advance(0.5);
  EXPECT_EQ(linesOf(lines, 2), 1);
  EXPECT_EQ(lines.heldBack(), 3U);
  clock.advance(1000);
  EXPECT_EQ(linesOf(lines, 4), 3);
}

TEST_F(AccountTest, AQuietTimeGivesNoMoreLinesAtOnceThanTheBurst) {
  LineAllowance lines(clock, {.burst = 3, .perSecond = 2});
  clock.advance(1000);
  EXPECT_EQ(linesOf(lines, 10), 3);
  clock.advance(1);
  EXPECT_EQ(linesOf(lines, 10), 2);
}

TEST_F(AccountTest, LinesThatComeOftenAreGivenTheirRate) {
  LineAllowance lines(clock, {.burst = 1, .perSecond = 2});
  int written = 0;
  for (int tenth = 0; tenth < 100; ++tenth, clock.advance(0.125)) written += linesOf(lines, 1);
  EXPECT_EQ(written, 25);
}

TEST_F(AccountTest, AClientsLinesCountForItsUser) {
  LineAllowance user(clock, {.burst = 3, .perSecond = 1});
  LineAllowance one(clock, {.burst = 2, .perSecond = 1}, &user);
  LineAllowance other(clock, {.burst = 2, .perSecond = 1}, &user);
  EXPECT_EQ(linesOf(one, 3), 2);
  EXPECT_EQ(linesOf(other, 2), 1);
}

TEST_F(AccountTest, ALineThatIsHeldBackCountsOnceForItsClientAndOnceForItsUser) {
  LineAllowance user(clock, {.burst = 3, .perSecond = 1});
  LineAllowance one(clock, {.burst = 2, .perSecond = 1}, &user);
  LineAllowance other(clock, {.burst = 2, .perSecond = 1}, &user);
  EXPECT_EQ(linesOf(one, 6), 2);
  EXPECT_EQ(one.heldBack(), 4U);
  EXPECT_EQ(user.heldBack(), 4U);
  EXPECT_EQ(linesOf(other, 2), 1);
  EXPECT_EQ(other.heldBack(), 1U);
  EXPECT_EQ(user.heldBack(), 5U);
}

}  // namespace
}  // namespace tonewerk
