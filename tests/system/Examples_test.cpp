// SPDX-License-Identifier: Apache-2.0
//
// The example programs, compiled as strangers compile them, and what becomes of what they say.
#include <string>

#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"
#include "tonewerk/reporting.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::HasSubstr;

class ExamplesTest : public DaemonTest, public ::testing::WithParamInterface<const char*> {
 protected:
  std::optional<std::string> run() { return outputOf({GetParam(), {}, daemon.clientEnvironment()}); }
};

TEST_P(ExamplesTest, ReportsWhatItsAudioThreadSays) {
  ASSERT_TRUE(daemon.start());
  const auto output = run();
  ASSERT_TRUE(output);
  EXPECT_THAT(*output, HasSubstr("report: " + std::string(twr_status_text(TWR_OK)) + "\n"));

  const RecordedEvents recorded(daemon.storePath());
  for (const char* name :
       {"com.orvane.tonewerk.Performance.State", "com.orvane.longformaudio.Performance.State"}) {
    SCOPED_TRACE(name);
    ASSERT_TRUE(waitUntil([&] { return recorded.named(name).size() >= 4; }));
    const std::vector<json> events = recorded.named(name);
    ASSERT_EQ(events.size(), 4U);
    for (std::size_t cycle = 0; cycle < events.size(); ++cycle) {
      EXPECT_EQ(events[cycle].at("cycle"), cycle);
      EXPECT_EQ(events[cycle].at("load"), 0.25 * static_cast<double>(cycle));
      EXPECT_TRUE(events[cycle].contains("twreporting_timestamp"));
      EXPECT_FALSE(events[cycle].contains("twreporting_dropped"));
    }
  }
  // The session has stopped, or there would be no summary of it.
  EXPECT_TRUE(waitUntil([&] {
    for (const std::string& name : recorded.names()) {
      if (name.find("Summary") != std::string::npos) return true;
    }
    return false;
  }));
}

TEST_P(ExamplesTest, EndsWellWithoutADaemon) {
  const auto output = run();
  ASSERT_TRUE(output);
  EXPECT_THAT(*output, HasSubstr("report: "));
  EXPECT_THAT(*output, ::testing::Not(HasSubstr("report: " + std::string(twr_status_text(TWR_OK)) + "\n")));
}

INSTANTIATE_TEST_SUITE_P(Programs, ExamplesTest, ::testing::Values(TONEWERK_EXAMPLE_C, TONEWERK_EXAMPLE_CXX),
                         [](const auto& tested) { return std::string(tested.index == 0 ? "C" : "Cxx"); });

}  // namespace
}  // namespace tonewerk
