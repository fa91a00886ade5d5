// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/DaemonHealth.h"

#include <system_error>

#include "tools/twctl/CommandLineTest.h"

namespace tonewerk {
namespace {

class DaemonHealthTest : public CommandLineTest {
 protected:
  const Tool tool_{out_, err_, json_};
};

TEST_F(DaemonHealthTest, WaitsNoLongerForAnAnswerThatNobodyWants) {
  daemon().keepSilentAbout("watch.accounts");
  std::stop_source stop;
  stop.request_stop();
  const ValueMap health = daemonHealth(tool_, stop.get_token());
  EXPECT_FALSE(health.boolean("answers"));
  EXPECT_EQ(health.text("reason"), std::make_error_code(std::errc::operation_canceled).message());
}

}  // namespace
}  // namespace tonewerk
