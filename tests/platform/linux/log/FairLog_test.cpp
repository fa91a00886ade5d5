// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/FairLog.h"

#include <array>
#include <chrono>
#include <cstdint>
#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "platform/LogLines.h"
#include "platform/accounts/Account.h"
#include "platform/accounts/LineAllowance.h"
#include "platform/accounts/WorkingFor.h"
#include "protocol/RequestSet.h"
#include "support/ForwardingLog.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using namespace std::chrono_literals;

constexpr LineAllowance::Rate kRate{.burst = 2, .perSecond = 1};

class FairLogTest : public ::testing::Test {
 protected:
  std::shared_ptr<Account> accountOf(std::uint32_t number) {
    return std::make_shared<Account>(number, totals, clock);
  }
  void write(const std::string& message) {
    log->write("com.orvane.tonewerk", "twri", LogLevel::kDefault, message);
  }
  void writeFor(const std::shared_ptr<Account>& account, LineAllowance& allowance, const std::string& message,
                int times = 1) {
    const WorkingFor scope(account, &allowance);
    for (int time = 0; time < times; ++time) write(message);
  }
  std::vector<std::string> written() const { return inner.textsOf("twri"); }
  // What the log says of itself.
  std::vector<std::string> said() const { return inner.textsOf("twrs", LogLevel::kError); }

  MemoryLog inner;
  ManualClock clock;
  const std::shared_ptr<ResourceTotals> totals = std::make_shared<ResourceTotals>();
  const std::shared_ptr<Account> user = accountOf(1000);
  const std::shared_ptr<Account> otherUser = accountOf(1001);
  LineAllowance lines{clock, kRate};
  LineAllowance otherLines{clock, kRate};
  std::optional<FairLog> log{std::in_place, std::make_unique<ForwardingLog>(inner), clock};
};

TEST_F(FairLogTest, ThreadsThatWorkForNobodyAreNotLimited) {
  for (int line = 0; line < 10'000; ++line) write("a");
  EXPECT_THAT(written(), SizeIs(10'000));
  EXPECT_THAT(said(), IsEmpty());
}

TEST_F(FairLogTest, LinesWithinTheAllowanceGoThrough) {
  writeFor(user, lines, "a", 2);
  EXPECT_THAT(written(), ElementsAre("a", "a"));
  EXPECT_THAT(said(), IsEmpty());
}

TEST_F(FairLogTest, LinesBeyondTheAllowanceAreHeldBackAndThatIsSaidOnce) {
  writeFor(user, lines, "a", 1'000'000);
  EXPECT_THAT(written(), ElementsAre("a", "a"));
  EXPECT_THAT(said(), ElementsAre("too many log lines of user 1000: holding back"));
}

TEST_F(FairLogTest, TheNextLineIsPrecededByHowManyWereHeldBack) {
  writeFor(user, lines, "a", 10);
  clock.advance(1s);
  inner.clear();
  writeFor(user, lines, "b");
  ASSERT_THAT(inner.lines(), SizeIs(2));
  EXPECT_EQ(inner.lines().front().text(), "log lines of user 1000 held back: 8");
  EXPECT_EQ(inner.lines().back().text(), "b");
}

TEST_F(FairLogTest, WhileLinesAreHeldBackTheyAreCountedOnceASecond) {
  LineAllowance few{clock, {.burst = 1, .perSecond = 0}};
  for (int tenth = 0; tenth <= 20; ++tenth, clock.advance(100ms)) writeFor(user, few, "a", 10);
  EXPECT_THAT(said(),
              ElementsAre("too many log lines of user 1000: holding back",
                          "log lines of user 1000 held back: 100", "log lines of user 1000 held back: 100"));
}

TEST_F(FairLogTest, ALineOfAnybodyIsPrecededByTheCountsThatAreDue) {
  writeFor(user, lines, "a", 5);
  writeFor(otherUser, otherLines, "a", 4);
  inner.clear();
  write("too early");
  EXPECT_THAT(said(), IsEmpty());
  clock.advance(1s);
  write("c");
  EXPECT_THAT(said(),
              ElementsAre("log lines of user 1000 held back: 3", "log lines of user 1001 held back: 2"));
  write("d");
  EXPECT_THAT(said(), SizeIs(2));
}

TEST_F(FairLogTest, NoOtherUserIsHeldBack) {
  writeFor(user, lines, "a", 100);
  writeFor(otherUser, otherLines, "b", 2);
  EXPECT_THAT(written(), ElementsAre("a", "a", "b", "b"));
}

TEST_F(FairLogTest, WhatAClientLeavesUnsaidWhenItGoesIsSaidAtTheEnd) {
  {
    LineAllowance ofClient{clock, kRate};
    writeFor(user, ofClient, "a", 7);
  }
  log.reset();
  EXPECT_THAT(said(), ElementsAre("too many log lines of user 1000: holding back",
                                  "log lines of user 1000 held back: 5"));
}

TEST_F(FairLogTest, HoldingBackIsSaidAgainAfterAPauseOnly) {
  LineAllowance few{clock, {.burst = 1, .perSecond = 0}};
  writeFor(user, few, "a", 3);
  clock.advance(999ms);
  writeFor(user, few, "a");
  EXPECT_THAT(said(), SizeIs(1));
  clock.advance(1s);
  writeFor(user, few, "a");
  EXPECT_THAT(said(), ElementsAre("too many log lines of user 1000: holding back",
                                  "too many log lines of user 1000: holding back",
                                  "log lines of user 1000 held back: 4"));
}

TEST_F(FairLogTest, TextThatTheDaemonHasCollectedIsNotHeldBack) {
  const WorkingFor scope(user, &lines);
  const LogLines kept;
  for (int block = 0; block < 100; ++block) write("BLOCK\nline\n");
  EXPECT_THAT(written(), SizeIs(100));
}

TEST_F(FairLogTest, ClientsWhoseUserIsUnknownAreNamedSo) {
  writeFor(accountOf(kNoUser), lines, "a", 3);
  EXPECT_THAT(said(), ElementsAre("too many log lines of unknown users: holding back"));
}

TEST_F(FairLogTest, SeveralThreadsLoseNoCount) {
  LineAllowance few{clock, {.burst = 10, .perSecond = 0}};
  {
    std::array<std::jthread, 4> threads;
    for (std::jthread& thread : threads) {
      thread = std::jthread([&] { writeFor(user, few, "a", 1000); });
    }
  }
  log.reset();
  EXPECT_THAT(written(), SizeIs(10));
  EXPECT_THAT(said(), Contains("log lines of user 1000 held back: 3990"));
}

}  // namespace
}  // namespace tonewerk
