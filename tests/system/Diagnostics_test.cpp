// SPDX-License-Identifier: Apache-2.0
//
// Tests what the daemon of an internal build writes to the disk when a recording contains symptoms of
// problems.
#include <chrono>
#include <filesystem>
#include <functional>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "system/support/DaemonTest.h"
#include "system/support/PrivatePipeWire.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;
using ::testing::UnorderedElementsAre;

class DiagnosticsTest : public DaemonTest {
 protected:
  void configure(const std::string& deviceFacts) {
    ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", deviceFacts));
    ASSERT_TRUE(daemon.writeConfiguration(
        "preferences/com.orvane.tonewerk.twreporting.toml",
        "VidroInvalidXyBackOffSeconds = 3600\n"
        "enable_whirlcap = true\n"
        "memory_tools = [\"echo 1 phys_footprint 2; echo left out\", \"echo slabs\"]\n"));
  }

  std::optional<std::string> twctl(std::vector<std::string> arguments) const {
    return outputOf({TONEWERK_TWCTL_PATH,
                     std::move(arguments),
                     {{"RUNTIME_DIRECTORY", daemon.path(DaemonProcess::kRuntime)},
                      {"STATE_DIRECTORY", daemon.path(DaemonProcess::kState)},
                      {"CONFIGURATION_DIRECTORY", daemon.path(DaemonProcess::kConfiguration)}}});
  }
  // Replays the whole example at once, so nothing that depends on the daemon's clock happens.
  bool replay() const {
    return twctl({"replay", "--speed", "max", TONEWERK_EXAMPLES_DIRECTORY "/diagnostics.jsonl"}).has_value();
  }

  // The items that a command lists, as JSON.
  std::vector<std::string> listed(const std::string& command) const {
    const std::string text = twctl({command, "--json"}).value_or("failed\n");
    std::vector<std::string> lines;
    for (std::size_t at = 0, end = 0; (end = text.find('\n', at)) != std::string::npos; at = end + 1) {
      lines.push_back(text.substr(at, end - at));
    }
    return lines;
  }
  bool waitForOneOf(const std::string& command) const {
    return waitUntil([&] { return listed(command).size() == 1; });
  }
  // Waits for text in the log; it may span the lines of one message.
  bool waitForLog(const std::string& text) const {
    return waitUntil([&] { return daemon.log().find(text) != std::string::npos; });
  }
  // Contents of a file of the latest item that a command shows.
  std::string latest(const std::string& command, const std::string& file) const {
    const json shown =
        json::parse(twctl({command, "show", "--latest", "--json"}).value_or(""), nullptr, false);
    return shown.is_object() ? textOfFile(shown.value("folder", "") + "/" + file) : "";
  }
};

TEST_F(DiagnosticsTest, TheExampleProvokesADraftAStallTraceAndAMemoryLog) {
  configure("InternalBuild = true\nHapticLeakCapture = true\n");
  PrivatePipeWire graph;
  ASSERT_TRUE(graph.start());
  ASSERT_TRUE(graph.addSink("speaker", "Test Speaker"));
  for (const auto& [name, value] : graph.environment()) daemon.setEnvironment(name, value);
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(replay());

  ASSERT_TRUE(waitForOneOf("drafts")) << daemon.log();
  // The session got its service type after it was created, so its process is not known.
  EXPECT_THAT(latest("drafts", "draft.md"),
              AllOf(StartsWith("# Invalid x/y coordinates during a Vidro call (IDR)\n"),
                    HasSubstr("- **Process:** not known\n"), HasSubstr("- `processes.txt` (")));
  EXPECT_THAT(latest("drafts", "request.json"),
              HasSubstr("\"displayReason\": \"a Vidro spatial positioning error occurred\""));

  ASSERT_TRUE(waitForOneOf("whirlcaps")) << daemon.log();
  const json request = json::parse(latest("whirlcaps", "request.json"), nullptr, false);
  ASSERT_TRUE(request.is_object());
  EXPECT_EQ(request["reason"], "AudioOverloads");
  EXPECT_EQ(request["description"], "org.example.Ringwork");
  EXPECT_EQ(request["payload"]["io_cycle"], 3);
  EXPECT_EQ(request["flags"], json::array({true, true}));
  EXPECT_THAT(latest("whirlcaps", "processes.txt"), HasSubstr("  twreportingd\n"));
  EXPECT_THAT(latest("whirlcaps", "log.txt"), HasSubstr("listening on "));
  EXPECT_THAT(latest("whirlcaps", "load.txt"), HasSubstr("/proc/loadavg"));
  EXPECT_TRUE(json::parse(latest("whirlcaps", "pipewire.json"), nullptr, false).is_array());
  EXPECT_THAT(latest("whirlcaps", "pipewire.json"), HasSubstr("Test Speaker"));

  EXPECT_TRUE(waitForLog("WIRED LOG BLOCK 1\nslabs\n"));
  EXPECT_TRUE(waitForLog("WIRED LOG BLOCK 1\nwiredlog: 1 phys_footprint 2\n"));
  EXPECT_THAT(daemon.log(), Not(HasSubstr("\nleft out")));

  // The symptoms did not last long enough.
  EXPECT_THAT(listed("captures"), IsEmpty());
}

// Tests sources of captures with the daemon's own clock: it takes 77 seconds.
class CaptureSourcesTest : public DiagnosticsTest {
 protected:
  static constexpr ReporterID kHeard = 1;
  static constexpr ReporterID kUnheard = 2;
  static constexpr ReporterID kMusic = 3;

  // Each message differs from the one before it.
  void soundQuietly(DaemonClient& client, ReporterID alarm) {
    client.send({{"issue_type", "LowRMS"}, {"n", ++sent}}, kCategoryError, kTypeIssueDetector, {alarm});
  }
  void leakHaptics(DaemonClient& client) {
    client.send({{"Haptic_Active_Hardware_Time_Seconds", ++sent}}, kCategoryGeneric, kTypeEnergybook,
                {kMusic});
  }
  // Repeats the symptom every second until the log says `line`.
  bool keepOnUntil(const std::string& line, const std::function<void()>& symptom) const {
    auto next = std::chrono::steady_clock::now();
    return waitUntil(
        [&] {
          if (logLinesWith(line) > 0) return true;
          if (std::chrono::steady_clock::now() < next) return false;
          symptom();
          next += std::chrono::seconds(1);
          return false;
        },
        kLongPatience);
  }

  static constexpr std::chrono::seconds kLongPatience{90};
  int sent = 0;
};

TEST_F(CaptureSourcesTest, OfSeveralSourcesOneIsCancelledAndTheOthersAreCaptured) {
  configure("InternalBuild = true\nHapticLeakCapture = true\n");
  ASSERT_TRUE(daemon.start());
  DaemonClient alarms = connect();
  DaemonClient player = connect();
  for (const ReporterID alarm : {kHeard, kUnheard}) {
    alarms.create(alarm, kServiceAlarms);
    alarms.start(alarm);
    soundQuietly(alarms, alarm);
    soundQuietly(alarms, alarm);
  }
  player.create(kMusic, 7);
  player.start(kMusic);
  leakHaptics(player);

  constexpr char kAccepted[] = "Parameters to Capsa session for alarm Low RMS accepted.";
  ASSERT_TRUE(keepOnUntil(kAccepted, [&] { soundQuietly(alarms, kHeard); })) << daemon.log();
  alarms.stop(kHeard);
  ASSERT_TRUE(waitForLogLine("capture cancelled. sessionId="));
  // A cancelled capture does not prevent the capture of other sources.
  soundQuietly(alarms, kUnheard);
  ASSERT_TRUE(waitUntil([&] { return logLinesWith(kAccepted) == 2; })) << daemon.log();
  ASSERT_TRUE(keepOnUntil("Started Capsa session for haptics leaks.", [&] { leakHaptics(player); }));

  ASSERT_TRUE(waitUntil([&] { return listed("captures").size() == 2; }, kLongPatience)) << daemon.log();
  EXPECT_EQ(logLinesWith("kFaultsignErrorRequestThrottled"), 0U);
  std::vector<std::string> services;
  for (const auto& entry :
       std::filesystem::directory_iterator(daemon.path(DaemonProcess::kState, "captures"))) {
    const json request = json::parse(textOfFile(entry.path() / "request.json"), nullptr, false);
    services.push_back(request.at("signature").at("type"));
  }
  EXPECT_THAT(services, UnorderedElementsAre("alarms", "longformaudio"));
}

TEST_F(DiagnosticsTest, TheBackOffOfDraftsSurvivesARestart) {
  configure("InternalBuild = true\n");
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(replay());
  ASSERT_TRUE(waitForOneOf("drafts")) << daemon.log();
  ASSERT_EQ(daemon.stop(), 0);
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(replay());
  ASSERT_TRUE(waitUntil([&] { return listed("whirlcaps").size() == 2; })) << daemon.log();
  EXPECT_THAT(listed("drafts"), SizeIs(1));
}

TEST_F(DiagnosticsTest, WhatIsPendingIsOnTheDiskWhenTheDaemonHasEnded) {
  configure("InternalBuild = true\n");
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(replay());
  ASSERT_EQ(daemon.stop(), 0);
  EXPECT_THAT(listed("drafts"), SizeIs(1));
  EXPECT_THAT(listed("whirlcaps"), SizeIs(1));
}

TEST_F(DiagnosticsTest, OtherBuildsLeaveNothing) {
  configure("InternalBuild = false\nHapticLeakCapture = true\n");
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(replay());
  ASSERT_EQ(daemon.stop(), 0);
  for (const std::string command : {"captures", "drafts", "whirlcaps"})
    EXPECT_THAT(listed(command), IsEmpty());
  EXPECT_EQ(logLinesWith("WIRED LOG BLOCK"), 0U);
}

TEST_F(DiagnosticsTest, WhatACrashLeftIsGoneAfterTheNextStart) {
  const std::string leftover = daemon.path(DaemonProcess::kState, "captures/.01JD.new");
  std::filesystem::create_directories(leftover);
  ASSERT_TRUE(daemon.start());
  EXPECT_TRUE(waitUntil([&] { return !std::filesystem::exists(leftover); }));
  EXPECT_TRUE(waitForLogLine("removed diagnostics that were not complete: 1"));
}

}  // namespace
}  // namespace tonewerk
