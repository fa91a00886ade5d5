// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/TroubleLog.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>

#include "platform/accounts/WorkingFor.h"
#include "support/ForwardingLog.h"
#include "support/TestAccounts.h"
#include "support/manual/ManualClock.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::IsEmpty;
using testing::SizeIs;

class TroubleLogTest : public testing::Test {
 protected:
  void write(LogLevel level, const std::string& message) {
    log.write("com.orvane.tonewerk", "twrs", level, message);
  }

  ManualClock clock;
  MemoryLog inner;
  std::shared_ptr<RecentTroubles> troubles = std::make_shared<RecentTroubles>();
  TroubleLog log{std::make_unique<ForwardingLog>(inner), troubles, clock};
};

TEST_F(TroubleLogTest, KeepsErrorsAndPassesAllLinesOn) {
  write(LogLevel::kDefault, "listening");
  EXPECT_THAT(troubles->all(), IsEmpty());
  clock.setNow(5.0);
  write(LogLevel::kError, "   cannot write");
  ASSERT_THAT(troubles->all(), SizeIs(1));
  const LoggedTrouble kept = troubles->all()[0];
  EXPECT_EQ(kept.text, "cannot write");
  EXPECT_EQ(kept.category, "twrs");
  EXPECT_EQ(kept.lastAt, 5.0);
  EXPECT_EQ(kept.user, std::nullopt);
  EXPECT_THAT(inner.textsOf("twrs"), testing::ElementsAre("listening", "   cannot write"));
}

TEST_F(TroubleLogTest, CountsEqualLinesAndPutsTheNewestFirst) {
  write(LogLevel::kError, "a");
  write(LogLevel::kError, "b");
  clock.setNow(9.0);
  write(LogLevel::kError, "a");
  const std::vector<LoggedTrouble> kept = troubles->all();
  ASSERT_THAT(kept, SizeIs(2));
  EXPECT_EQ(kept[0].text, "a");
  EXPECT_EQ(kept[0].times, 2U);
  EXPECT_EQ(kept[0].lastAt, 9.0);
  EXPECT_EQ(kept[1].text, "b");
}

// A client can cause error lines; they must not look like the daemon's own.
TEST_F(TroubleLogTest, SaysWhoseRequestCausedALine) {
  TestAccounts accounts{990};
  const std::shared_ptr<Account> account = accounts->of(1000);
  {
    const WorkingFor scope(account);
    write(LogLevel::kError, "a");
  }
  write(LogLevel::kError, "a");
  const std::vector<LoggedTrouble> kept = troubles->all();
  ASSERT_THAT(kept, SizeIs(2)) << "they are not counted together";
  EXPECT_EQ(kept[0].user, std::nullopt);
  EXPECT_EQ(kept[1].user, 1000U);
}

TEST_F(TroubleLogTest, KeepsOnlyTheNewestAndCutsLongTexts) {
  for (std::size_t line = 0; line <= RecentTroubles::kMaxLines; ++line)
    write(LogLevel::kError, "line " + std::to_string(line));
  EXPECT_THAT(troubles->all(), SizeIs(RecentTroubles::kMaxLines));
  EXPECT_EQ(troubles->all().back().text, "line 1");
  write(LogLevel::kError, std::string(RecentTroubles::kMaxTextBytes + 1, 'x'));
  EXPECT_THAT(troubles->all().front().text, SizeIs(RecentTroubles::kMaxTextBytes));
}

}  // namespace
}  // namespace tonewerk
