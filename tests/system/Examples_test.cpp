// SPDX-License-Identifier: Apache-2.0
//
// Tests the example programs, compiled as users compile them, and the reports of their messages.
#include <filesystem>
#include <map>
#include <string>

#include "system/support/DaemonTest.h"
#include "system/support/RecordedEvents.h"
#include "tonewerk/reporting.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::HasSubstr;

// Runs an example with twctl in PATH and with the daemon's store where twctl looks for it.
std::optional<std::string> outputOfExample(const char* program, const DaemonProcess& daemon) {
  std::map<std::string, std::string> environment = daemon.clientEnvironment();
  environment["STATE_DIRECTORY"] = daemon.path(DaemonProcess::kState);
  environment["PATH"] = std::filesystem::path(TONEWERK_TWCTL_PATH).parent_path().string() + ":/usr/bin:/bin";
  return outputOf({program, {}, environment});
}

class ExamplesTest : public DaemonTest, public ::testing::WithParamInterface<const char*> {
 protected:
  std::optional<std::string> run() { return outputOfExample(GetParam(), daemon); }
};

TEST_P(ExamplesTest, ReportsWhatItsAudioThreadSays) {
  ASSERT_TRUE(daemon.start());
  const auto output = run();
  ASSERT_TRUE(output);
  EXPECT_THAT(*output, HasSubstr("report: " + std::string(twr_status_text(TWR_OK)) + "\n"));

  const RecordedEvents recorded(daemon.storePath());
  for (const char* name : {"com.orvane.tonewerk.Playback.State", "com.orvane.longformaudio.Playback.State"}) {
    SCOPED_TRACE(name);
    ASSERT_TRUE(waitUntil([&] { return recorded.named(name).size() >= 5; }));
    const std::vector<json> events = recorded.named(name);
    ASSERT_EQ(events.size(), 5U);
    for (std::size_t cycle = 0; cycle < events.size(); ++cycle) {
      EXPECT_EQ(events[cycle].at("cycle"), cycle);
      EXPECT_EQ(events[cycle].at("session_output_running"), cycle < 4);
      EXPECT_EQ(events[cycle].at("HostApplicationDisplayID"), "org.example.Report");
      EXPECT_TRUE(events[cycle].contains("twreporting_timestamp"));
      EXPECT_FALSE(events[cycle].contains("twreporting_dropped"));
    }
  }
  const char* summary = "com.orvane.longformaudio.Volume.Summary";
  ASSERT_TRUE(waitUntil([&] { return !recorded.named(summary).empty(); }));
  const json made = recorded.named(summary).front();
  EXPECT_EQ(made.at("HostApplicationDisplayID"), "org.example.Report");
  EXPECT_EQ(made.at("QMSessionVolume"), 0.5);
  EXPECT_EQ(made.at("active_devices"), "Speaker");
  EXPECT_GE(made.at("play_seconds"), 0.9);
}

TEST_P(ExamplesTest, PrintsTheVolumeSummaryThatCameOfIt) {
  ASSERT_TRUE(daemon.start());
  const auto output = run();
  ASSERT_TRUE(output);
  EXPECT_THAT(*output, HasSubstr("org.example.Report  Volume.Summary  "));
  EXPECT_THAT(*output, HasSubstr("QMSessionVolume=0.5 active_devices=Speaker"));
}

// The example asks for the answer to its start, destroys the session, flushes, and destroys the client.
TEST(ExampleInCxxTest, IsToldThatItsSessionHasStopped) {
  DaemonProcess daemon;
  ASSERT_TRUE(daemon.start());
  const auto output = outputOfExample(TONEWERK_EXAMPLE_CXX, daemon);
  ASSERT_TRUE(output);
  EXPECT_THAT(*output, HasSubstr("stopped: done\n"));
}

TEST_P(ExamplesTest, EndsWellWithoutADaemon) {
  const auto output = run();
  ASSERT_TRUE(output);
  EXPECT_THAT(*output, HasSubstr("report: "));
  EXPECT_THAT(*output, ::testing::Not(HasSubstr("report: " + std::string(twr_status_text(TWR_OK)) + "\n")));
}

INSTANTIATE_TEST_SUITE_P(Programs, ExamplesTest, ::testing::Values(TONEWERK_EXAMPLE_C, TONEWERK_EXAMPLE_CXX),
                         [](const auto& tested) { return std::string(tested.index == 0 ? "C" : "Cxx"); });

class PlayersTest : public DaemonTest, public ::testing::WithParamInterface<const char*> {};

TEST_P(PlayersTest, GetTheirSummariesWithoutAKey) {
  ASSERT_TRUE(daemon.start());
  const auto output = outputOfExample(GetParam(), daemon);
  ASSERT_TRUE(output);
  EXPECT_EQ(*output, "player: done\n");

  const RecordedEvents recorded(daemon.storePath());
  const char* end = "com.orvane.longformaudio.Session_Generic.Summary";
  ASSERT_TRUE(waitUntil([&] { return !recorded.named(end).empty(); }));
  const std::vector<json> volumes = recorded.named("com.orvane.longformaudio.Volume.Summary");
  ASSERT_EQ(volumes.size(), 2U);
  for (const json& volume : volumes) {
    EXPECT_EQ(volume.at("HostApplicationDisplayID"), "org.example.Player");
    EXPECT_EQ(volume.at("active_devices"), "Speaker");
    EXPECT_EQ(volume.at("session_selected_format"), "48000 Hz, 2 ch, lpcm");
    EXPECT_EQ(volume.at("mFormatID"), "lpcm");
    EXPECT_EQ(volume.at("mChannelsPerFrame"), 2);
    EXPECT_GE(volume.at("play_seconds"), 0.74);
  }
  EXPECT_EQ(volumes[0].at("QMSessionVolume"), 0.5);
  EXPECT_EQ(volumes[1].at("QMSessionVolume"), 0.3);
  const json session = recorded.named(end).front();
  EXPECT_EQ(session.at("overload_count"), 1);
  EXPECT_EQ(session.at("active_count"), 1);
  EXPECT_GE(session.at("total_active_time"), 1.4);
}

TEST_P(PlayersTest, SayThatThereIsNoDaemon) {
  const auto output = outputOfExample(GetParam(), daemon);
  EXPECT_EQ(output.value_or(""), "player: not connected to the daemon\n");
}

INSTANTIATE_TEST_SUITE_P(Programs, PlayersTest, ::testing::Values(TONEWERK_PLAYER_C, TONEWERK_PLAYER_CXX),
                         [](const auto& tested) { return std::string(tested.index == 0 ? "C" : "Cxx"); });

}  // namespace
}  // namespace tonewerk
