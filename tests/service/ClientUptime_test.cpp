// SPDX-License-Identifier: Apache-2.0
#include "service/ClientUptime.h"

#include <gtest/gtest.h>

#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class ClientUptimeTest : public ReportingTest {
 protected:
  std::vector<ValueMap> events() {
    return test.metricon.eventsNamed("com.orvane.tonewerk.twreportingclientuptime");
  }
};

TEST_F(ClientUptimeTest, IsTheTimeSinceTheStartDate) {
  sendClientUptime(11, test.clock.now() - 12.75, "player");
  ASSERT_THAT(events(), SizeIs(1));
  EXPECT_EQ(events()[0].text(), R"({"processName":"player","seconds":12.75})");
  EXPECT_THAT(test.log.textsOf("twrs"),
              ElementsAre("invalidationHandler: connection exited process=player uptime_sec=12"));
}

TEST_F(ClientUptimeTest, WithoutAStartDateItIsMinusOneSecond) {
  sendClientUptime(11, std::nullopt, "player");
  ASSERT_THAT(events(), SizeIs(1));
  EXPECT_EQ(events()[0].text(), R"({"processName":"player","seconds":-1})");
  EXPECT_THAT(test.log.textsOf("twrs"),
              ElementsAre("clientStartDate is nil. clientpid=11 clientprocessname=player",
                          "invalidationHandler: connection exited process=player uptime_sec=-1"));
}

TEST_F(ClientUptimeTest, WithAStartDateInTheFutureItIsTheDifferenceAndIsLogged) {
  sendClientUptime(11, test.clock.now() + 100, "player");
  ASSERT_THAT(events(), SizeIs(1));
  EXPECT_EQ(events()[0].number("seconds"), 100.0);
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kError),
              ElementsAre("clientStartDate is in the past. clientpid=11 clientprocessname=player"));
}

TEST_F(ClientUptimeTest, WithoutAProcessNameNothingIsSent) {
  sendClientUptime(11, test.clock.now(), std::nullopt);
  EXPECT_THAT(events(), IsEmpty());
  EXPECT_THAT(test.log.textsOf("twrs"),
              ElementsAre("invalidationHandler: connection exited process=(null) uptime_sec=0",
                          "clientProcessName is nil. clientpid=11"));
}

// Such a client may only check whether the daemon listens.
TEST_F(ClientUptimeTest, AClientThatLeftBeforeItWasRegisteredIsNotAnError) {
  sendClientUptime(11, std::nullopt, std::nullopt);
  EXPECT_THAT(test.log.textsOf("twrs", LogLevel::kInfo), SizeIs(3));
  EXPECT_THAT(test.log.textsAt(LogLevel::kError), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
