// SPDX-License-Identifier: Apache-2.0
//
// Tests real playback through PipeWire, the bridge and the daemon, up to the daemon's store and files.
#include <algorithm>
#include <chrono>
#include <filesystem>
#include <gmock/gmock.h>
#include <nlohmann/json.hpp>
#include <signal.h>
#include <sqlite3.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "system/support/DaemonProcess.h"
#include "system/support/PrivatePipeWire.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using ::testing::EndsWith;
using ::testing::SizeIs;
using ::testing::StartsWith;

// The payloads of all recorded events of this name, oldest first. Empty without a readable store.
std::vector<nlohmann::json> eventsOf(const std::string& storePath, const std::string& name) {
  std::vector<nlohmann::json> events;
  sqlite3* database = nullptr;
  sqlite3_stmt* statement = nullptr;
  if (sqlite3_open_v2(storePath.c_str(), &database, SQLITE_OPEN_READONLY, nullptr) == SQLITE_OK &&
      sqlite3_prepare_v2(database, "SELECT payload FROM analytics_event WHERE name = ? ORDER BY id", -1,
                         &statement, nullptr) == SQLITE_OK) {
    sqlite3_bind_text(statement, 1, name.c_str(), -1, nullptr);
    while (sqlite3_step(statement) == SQLITE_ROW) {
      const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, 0));
      events.push_back(nlohmann::json::parse(text, nullptr, false));
    }
  }
  sqlite3_finalize(statement);
  sqlite3_close(database);
  return events;
}

class PipeWireBridgeTest : public ::testing::Test {
 protected:
  static constexpr const char* kPlayer = "pw-play";
  static constexpr const char* kSummary = "com.orvane.longformaudio.Volume.Summary";

  void SetUp() override {
    ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = true\n"));
    ASSERT_TRUE(daemon.start());
    ASSERT_TRUE(graph.start());
    ASSERT_TRUE(graph.addSink("speaker", "Test Speaker"));
    std::map<std::string, std::string> environment = graph.environment();
    environment.merge(daemon.clientEnvironment());
    ASSERT_TRUE(
        bridge.start({TONEWERK_BRIDGE_PATH, {"--verbose"}, environment}, path("bridge"), path("bridge")));
    ASSERT_TRUE(waitForBridge("connected to PipeWire", 1));
    ASSERT_TRUE(waitForBridge("connected to the reporting daemon", 1));
  }
  void TearDown() override {
    if (!HasFailure()) return;
    std::fprintf(stderr, "--- bridge:\n%s--- graph:\n%s--- daemon:\n%s", textOfFile(path("bridge")).c_str(),
                 graph.log().c_str(), daemon.log().c_str());
  }

  std::string path(const std::string& name) const { return directory.path(name); }

  // Waits until the bridge has written this text at least `times` times.
  bool waitForBridge(const std::string& text, int times) {
    return waitUntil([&] {
      const std::string said = textOfFile(path("bridge"));
      int count = 0;
      for (std::size_t at = said.find(text); at != std::string::npos; at = said.find(text, at + 1)) ++count;
      return count >= times;
    });
  }

  // Plays until stopPlaying(). Waits until the bridge has noticed it, for the `times`th time. Returns the
  // stream's node, or 0 when it does not run.
  std::uint32_t play(int times = 1) {
    EXPECT_TRUE(
        player.start({kPlayer, {graph.makeTone(60)}, graph.environment()}, path("player"), path("player")));
    std::optional<std::uint32_t> node;
    EXPECT_TRUE(waitUntil([&] { return (node = graph.runningNode(kPlayer)).has_value(); }));
    EXPECT_TRUE(waitForBridge(R"("session_output_running":true)", times));
    return node.value_or(0);
  }
  void stopPlaying() {
    player.signal(SIGTERM);
    EXPECT_TRUE(player.wait());
  }
  static void listenFor(milliseconds time) { std::this_thread::sleep_for(time); }

  std::string channelFile() const {
    return daemon.path(DaemonProcess::kRuntime, "channels/tw-pipewire-" + std::to_string(getuid()) + ".json");
  }
  // The channel that the bridge has published for the speaker; an empty object without one.
  nlohmann::json channelOfSpeaker(const std::string& name) const {
    const nlohmann::json content = nlohmann::json::parse(textOfFile(channelFile()), nullptr, false);
    if (!content.is_object()) return nlohmann::json::object();
    for (const nlohmann::json& channel : content.at("channels")) {
      if (channel.at("group") == "Tx" && channel.value("subgroup", "") == "speaker" &&
          channel.at("name") == name) {
        return channel;
      }
    }
    return nlohmann::json::object();
  }
  std::int64_t counted(const std::string& name) const { return channelOfSpeaker(name).value("value", -1); }

  std::vector<nlohmann::json> summaries() const { return eventsOf(daemon.storePath(), kSummary); }

  std::vector<std::filesystem::path> summaryFiles() const {
    std::vector<std::filesystem::path> files;
    std::error_code error;
    for (const auto& entry :
         std::filesystem::directory_iterator(daemon.path(DaemonProcess::kLogs, "Audio/Reporting"), error)) {
      files.push_back(entry.path());
    }
    return files;
  }

  const TemporaryDirectory directory;
  DaemonProcess daemon;
  PrivatePipeWire graph;
  ChildProcess bridge;
  ChildProcess player;
};

TEST_F(PipeWireBridgeTest, SummarisesPlaybackByVolume) {
  const auto begin = std::chrono::steady_clock::now();
  const std::uint32_t node = play();
  listenFor(milliseconds(1500));
  ASSERT_TRUE(graph.outputOf("wpctl", {"set-volume", std::to_string(node), "0.3"}));
  ASSERT_TRUE(waitForBridge(R"("QMSessionVolume":0.3)", 1));
  listenFor(milliseconds(1500));
  stopPlaying();
  const std::chrono::duration<double> played = std::chrono::steady_clock::now() - begin;

  ASSERT_TRUE(waitUntil([&] { return summaries().size() >= 2; }));
  bridge.signal(SIGTERM);
  EXPECT_EQ(bridge.wait(), 0);
  EXPECT_EQ(daemon.stop(), 0);

  const std::vector<nlohmann::json> found = summaries();
  ASSERT_THAT(found, SizeIs(2));
  double total = 0;
  for (const nlohmann::json& summary : found) {
    EXPECT_EQ(summary.at("active_devices"), "Test Speaker");
    EXPECT_EQ(summary.at("HostApplicationDisplayID"), "pw-cat");
    EXPECT_EQ(summary.at("mFormatID"), "lpcm");
    EXPECT_EQ(summary.at("mChannelsPerFrame"), 2);
    EXPECT_THAT(summary.at("session_selected_format").get<std::string>(), EndsWith("48000 Hz 2 ch"));
    EXPECT_EQ(summary.at("msgcnt"), 2);
    EXPECT_GT(summary.at("play_seconds").get<double>(), 1.0);
    total += summary.at("play_seconds").get<double>();
  }
  EXPECT_EQ(found[0].at("QMSessionVolume"), 1.0);
  EXPECT_EQ(found[1].at("QMSessionVolume"), 0.3);
  EXPECT_EQ(found[1].at("QMSessionVolumeBucketed"), "0.3125");
  EXPECT_GT(total, 3.0);
  EXPECT_LE(total, played.count());

  const std::vector<std::filesystem::path> files = summaryFiles();
  ASSERT_THAT(files, SizeIs(1));
  EXPECT_THAT(files[0].filename().string(), EndsWith("-pw-cat-longformaudio.json"));
  const nlohmann::json file = nlohmann::json::parse(textOfFile(files[0]), nullptr, false);
  ASSERT_TRUE(file.is_array());
  const auto entries = [&](const std::string& name) {
    return std::count_if(file.begin(), file.end(),
                         [&](const nlohmann::json& entry) { return entry.contains(name); });
  };
  EXPECT_EQ(entries("Volume_Summary_2"), 1);
  EXPECT_EQ(entries("Volume_Summary_3"), 0);
  EXPECT_EQ(entries("Output_Stop_1"), 1);
}

TEST_F(PipeWireBridgeTest, EndsTheSessionsOfWhatStillPlaysWhenItIsStopped) {
  play();
  listenFor(milliseconds(1000));
  bridge.signal(SIGTERM);
  EXPECT_EQ(bridge.wait(), 0);
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(summaries(), SizeIs(1));
  const std::vector<nlohmann::json> ends =
      eventsOf(daemon.storePath(), "com.orvane.longformaudio.Output.Stop");
  ASSERT_THAT(ends, SizeIs(1));
  EXPECT_GT(ends[0].at("session_duration").get<double>(), 1.0);
}

TEST_F(PipeWireBridgeTest, PublishesWhatTheGraphsDriversDo) {
  ASSERT_TRUE(waitUntil([&] { return counted("Cycles") == 0; }));
  play();
  ASSERT_TRUE(waitUntil([&] { return counted("Cycles") > 20; }));
  const nlohmann::json period = channelOfSpeaker("Period");
  EXPECT_EQ(period.at("unit"), "us");
  EXPECT_GT(period.at("min"), 0);
  std::int64_t hits = 0;
  const nlohmann::json processing = channelOfSpeaker("Processing Time");
  for (const nlohmann::json& bucket : processing.at("buckets")) {
    hits += bucket.at("hits").get<std::int64_t>();
  }
  EXPECT_GT(hits, 0);

  bridge.signal(SIGTERM);
  EXPECT_EQ(bridge.wait(), 0);
  EXPECT_FALSE(std::filesystem::exists(channelFile()));
}

// This is the daemon's first session, so the channels that it subscribes to must already exist.
TEST_F(PipeWireBridgeTest, HasTheDaemonReportWhatTheDriversDidDuringASession) {
  play();
  ASSERT_TRUE(waitUntil([&] { return counted("Cycles") > 20; }));
  stopPlaying();

  const std::string simple = "com.orvane.longformaudio.Chanmetering.Simple";
  const std::string histogram = "com.orvane.longformaudio.Chanmetering.Histogram";
  ASSERT_TRUE(waitUntil([&] { return eventsOf(daemon.storePath(), histogram).size() == 1; }));
  ASSERT_THAT(eventsOf(daemon.storePath(), simple), SizeIs(1));
  const nlohmann::json counts = eventsOf(daemon.storePath(), simple)[0];
  const std::int64_t cycles = counts.at("PipeWire_Tx_speaker_Simple_Cycles");
  EXPECT_GT(cycles, 20);
  EXPECT_EQ(counts.at("PipeWire_Tx_Simple_Cycles"), cycles);
  EXPECT_FALSE(counts.contains("PipeWire_Rx_Simple_Cycles"));
  const nlohmann::json times = eventsOf(daemon.storePath(), histogram)[0];
  const std::string period = times.at("PipeWire_Tx_speaker_Histogram_Period");
  EXPECT_THAT(period, StartsWith("count=9,lower=0,upper=1000000,min="));
  EXPECT_THAT(times.at("PipeWire_Tx_speaker_Histogram_ProcessingTime").get<std::string>(),
              StartsWith("count=14,lower=0,upper=1000,min="));
}

TEST_F(PipeWireBridgeTest, ReportsOverloadsOfAStreamThatHangs) {
  play();
  ASSERT_TRUE(waitUntil([&] { return counted("Cycles") > 20; }));
  // The driver continues without the stopped player.
  player.signal(SIGSTOP);
  const std::int64_t before = counted("Incomplete Cycles");
  // Dozens of cycles, so that nothing but the stop can be the cause.
  ASSERT_TRUE(waitUntil([&] { return counted("Incomplete Cycles") > before + 30; }));
  player.signal(SIGCONT);

  const std::string name = "com.orvane.longformaudio.IO.Error";
  ASSERT_TRUE(waitUntil([&] { return !eventsOf(daemon.storePath(), name).empty(); }));
  const nlohmann::json overload = eventsOf(daemon.storePath(), name).front();
  EXPECT_EQ(overload.at("issue_type"), "overload");
  EXPECT_EQ(overload.at("HostApplicationDisplayID"), "pw-cat");
  EXPECT_GT(overload.at("smallest_buffer_frame_size"), 0);
  EXPECT_GT(overload.at("io_cycle"), 0);
  EXPECT_GT(overload.at("xrun_count"), 0);
  // The machine may be busy, so other overloads may come before that of the stop.
  ASSERT_TRUE(waitUntil([&] {
    for (const nlohmann::json& event : eventsOf(daemon.storePath(), name)) {
      if (event.value("glitch_cause", "") == "stuck") return true;
    }
    return false;
  }));
  for (const nlohmann::json& event : eventsOf(daemon.storePath(), name)) {
    if (event.value("glitch_cause", "") != "stuck") continue;
    EXPECT_EQ(event.at("glitch_culprit_node"), kPlayer);
    EXPECT_EQ(event.at("glitch_culprit_application"), "pw-cat");
    EXPECT_EQ(event.at("glitch_device"), "speaker");
    EXPECT_FALSE(nlohmann::json::parse(event.at("glitch_cycles").get<std::string>(), nullptr, false).empty());
  }
  stopPlaying();

  const std::string summary = "com.orvane.longformaudio.Session_Generic.Summary";
  ASSERT_TRUE(waitUntil([&] { return !eventsOf(daemon.storePath(), summary).empty(); }));
  EXPECT_GT(eventsOf(daemon.storePath(), summary).front().at("overload_count"), 0);
}

TEST_F(PipeWireBridgeTest, FollowsPipeWireAndTheDaemonThroughTheirRestarts) {
  play();

  EXPECT_EQ(daemon.stop(), 0);
  ASSERT_TRUE(daemon.start());
  ASSERT_TRUE(waitForBridge("connected to the reporting daemon", 2));
  ASSERT_TRUE(waitForBridge("\"session_output_running\":true", 2));
  listenFor(milliseconds(1000));

  graph.stop();
  ASSERT_TRUE(waitForBridge("lost PipeWire", 1));
  player.kill();
  ASSERT_TRUE(waitUntil([&] { return summaries().size() == 1; }));

  ASSERT_TRUE(graph.start());
  ASSERT_TRUE(graph.addSink("headset", "Test Headset"));
  ASSERT_TRUE(waitForBridge("connected to PipeWire", 2));
  play(3);
  listenFor(milliseconds(1000));
  stopPlaying();
  ASSERT_TRUE(waitUntil([&] { return summaries().size() == 2; }));
  EXPECT_EQ(summaries()[0].at("active_devices"), "Test Speaker");
  EXPECT_EQ(summaries()[1].at("active_devices"), "Test Headset");
}

}  // namespace
}  // namespace tonewerk
