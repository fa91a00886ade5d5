// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/StreamReporter.h"

#include <cmath>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <utility>

#include "bridges/pipewire/sessions/StreamReports.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualEventLoop.h"
#include "support/memory/MemorySessionSink.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

// Reports one stream through StreamReports, so that its timer is tested too.
class StreamReporterTest : public ::testing::Test {
 protected:
  static constexpr std::uint32_t kStream = 40;

  StreamReporterTest() {
    state.described = true;
    state.application = "com.example.player";
    state.role = "Music";
    state.volume = 0.5;
    state.format = AudioFormat{"lpcm", "F32LE", 48'000, 2};
    state.device = "Speaker";
  }

  void update() { reports.streamChanged(kStream, state); }
  void setRunning(bool running) {
    state.running = running;
    update();
  }
  void setVolume(double volume) {
    state.volume = volume;
    update();
  }
  void setDevice(const char* device) {
    state.device = device;
    update();
  }
  void leave() { reports.streamGone(kStream); }
  void play() {
    setRunning(true);
    clock.advance(1.0);
  }

  // The messages of a session, such as "3 on 0.5 Speaker": seconds since the test began, running, volume and
  // devices. "end" and the duration follow in a message that has one.
  std::vector<std::string> sent(std::size_t session = 0) {
    std::vector<std::string> lines;
    if (sink.sessions.size() <= session) return lines;
    for (const MemorySessionSink::Message& message : sink.sessions[session].messages) {
      if (message.category != 5) continue;
      const ValueMap& map = message.payload;
      std::string line = textOf(rounded(map.number("twreporting_timestamp") - kBegin));
      line += map.boolean("session_output_running") ? " on" : " off";
      line += " " + textOf(map.find("QMSessionVolume")) + " " + textOf(map.find("active_devices"));
      if (map.contains("session_duration")) line += " end " + textOf(rounded(map.number("session_duration")));
      lines.push_back(std::move(line));
    }
    return lines;
  }
  // The overloads of a session, such as "cycle 7: 2": the driver's cycle and the number of xruns.
  std::vector<std::string> overloads(std::size_t session = 0) {
    std::vector<std::string> lines;
    if (sink.sessions.size() <= session) return lines;
    for (const MemorySessionSink::Message& message : sink.sessions[session].messages) {
      if (message.category != 7) continue;
      lines.push_back("cycle " + message.payload.text("io_cycle") + ": " +
                      message.payload.text("xrun_count"));
    }
    return lines;
  }
  static double rounded(double seconds) { return std::round(seconds * 1000.0) / 1000.0; }

  static constexpr double kBegin = ManualClock::kStart;
  ManualClock clock{kBegin};
  ManualEventLoop loop{clock};
  MemorySessionSink sink;
  ReporterIdentifiers identifiers{clock, 1};
  StreamReports reports{sink, clock, identifiers, loop};
  StreamState state;
};

TEST_F(StreamReporterTest, BeginsASessionForAStreamThatIsDescribed) {
  update();
  ASSERT_THAT(sink.sessions, SizeIs(1));
  EXPECT_THAT(sink.only().calls, ElementsAre("create", "configure", "start"));
  EXPECT_EQ(sink.only().serviceType, 7);
  EXPECT_EQ(sink.only().configuration, (ValueMap{{"HostApplicationDisplayID", "com.example.player"}}));
}

TEST_F(StreamReporterTest, WaitsForTheDescriptionForALimitedTime) {
  state.described = false;
  update();
  EXPECT_THAT(sink.sessions, IsEmpty());
  clock.advance(StreamReporter::kMaxHold);
  EXPECT_THAT(sink.sessions, SizeIs(1));
}

TEST_F(StreamReporterTest, SendsAStartWithTheWholeState) {
  clock.advance(2.0);
  play();
  ASSERT_THAT(sink.sessions, SizeIs(1));
  ASSERT_THAT(sink.only().messages, SizeIs(1));
  const MemorySessionSink::Message& message = sink.only().messages[0];
  EXPECT_EQ(message.category, 5U);
  EXPECT_EQ(message.type, 0);
  EXPECT_EQ(message.payload, (ValueMap{{"twreporting_timestamp", kBegin + 2.0},
                                       {"session_output_running", true},
                                       {"QMSessionVolume", 0.5},
                                       {"active_devices", "Speaker"},
                                       {"session_selected_format", "F32LE 48000 Hz 2 ch"},
                                       {"mFormatID", "lpcm"},
                                       {"mChannelsPerFrame", 2}}));
}

TEST_F(StreamReporterTest, HoldsAStartUntilItsDeviceIsKnownAndKeepsTheStartTime) {
  state.device = "";
  setRunning(true);
  clock.advance(0.5);
  EXPECT_THAT(sent(), IsEmpty());
  setDevice("Speaker");
  clock.advance(0.5);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker"));
}

TEST_F(StreamReporterTest, HoldsAStartUntilItsFormatIsKnown) {
  const std::optional<AudioFormat> format = std::exchange(state.format, std::nullopt);
  setRunning(true);
  clock.advance(0.5);
  EXPECT_THAT(sent(), IsEmpty());
  state.format = format;
  update();
  clock.advance(0.5);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker"));
}

TEST_F(StreamReporterTest, HoldsAnIncompleteStartForAtMostASecond) {
  state.device = "";
  setRunning(true);
  clock.advance(StreamReporter::kMaxHold);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 (null)"));
}

TEST_F(StreamReporterTest, SendsOneStartWithTheSettledVolume) {
  setVolume(1.0);
  setRunning(true);
  clock.advance(0.05);
  setVolume(0.4);  // the volume that the session manager has stored for this application
  clock.advance(1.0);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.4 Speaker"));
}

TEST_F(StreamReporterTest, SendsAVolumeChangeWithItsTime) {
  play();
  clock.advance(2.0);
  setVolume(0.3);
  clock.advance(1.0);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "3 on 0.3 Speaker"));
}

TEST_F(StreamReporterTest, SendsOnlyTheVolumeAtTheEndOfADrag) {
  play();
  for (const double step : {0.45, 0.4, 0.35, 0.3}) {
    clock.advance(0.1);
    setVolume(step);
  }
  clock.advance(1.0);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "1.4 on 0.3 Speaker"));
}

TEST_F(StreamReporterTest, SendsOneMessageASecondDuringALongDrag) {
  play();
  for (int step = 0; step < 30; ++step) {
    clock.advance(0.1);
    setVolume(0.5 + 0.01 * (step + 1));
  }
  EXPECT_THAT(sent(), SizeIs(3));
}

TEST_F(StreamReporterTest, SendsNothingForAChangeThatIsUndone) {
  play();
  setVolume(0.6);
  clock.advance(0.05);
  setVolume(0.5);
  clock.advance(1.0);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker"));
}

TEST_F(StreamReporterTest, DoesNotHoldAChangeLongerForOtherChanges) {
  play();
  setVolume(0.3);
  clock.advance(0.15);
  state.application = "renamed";
  update();
  clock.advance(0.05);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "1 on 0.3 Speaker"));
}

TEST_F(StreamReporterTest, SendsOneMessageForAMoveToAnotherSink) {
  play();
  for (const char* step : {"", "Headset, Speaker", "Headset"}) setDevice(step);
  clock.advance(1.0);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "1 on 0.5 Headset"));
}

TEST_F(StreamReporterTest, SendsAPauseAtOnce) {
  play();
  setRunning(false);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "1 off 0.5 Speaker"));
}

TEST_F(StreamReporterTest, SendsAHeldChangeBeforeAPause) {
  play();
  setVolume(0.3);
  clock.advance(0.1);
  setRunning(false);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "1 on 0.3 Speaker", "1.1 off 0.3 Speaker"));
}

TEST_F(StreamReporterTest, SendsStartAndPauseOfASoundShorterThanTheSettleTime) {
  setRunning(true);
  clock.advance(0.1);
  setRunning(false);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "0.1 off 0.5 Speaker"));
}

TEST_F(StreamReporterTest, SendsAVolumeChangeDuringAPause) {
  play();
  setRunning(false);
  setVolume(0.8);
  clock.advance(1.0);
  setRunning(true);
  clock.advance(1.0);
  EXPECT_THAT(sent(),
              ElementsAre("0 on 0.5 Speaker", "1 off 0.5 Speaker", "1 off 0.8 Speaker", "2 on 0.8 Speaker"));
}

TEST_F(StreamReporterTest, KeepsDeviceAndFormatDuringAPause) {
  play();
  state.device = "";
  state.format.reset();
  setRunning(false);
  clock.advance(1.0);
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "1 off 0.5 Speaker"));
}

// The daemon drops a message that differs from the one before it in nothing but its time.
TEST_F(StreamReporterTest, RepeatsNoMessage) {
  play();
  for (int round = 0; round < 3; ++round) {
    setRunning(false);
    clock.advance(1.0);
    setRunning(true);
    clock.advance(1.0);
  }
  const std::vector<MemorySessionSink::Message>& messages = sink.only().messages;
  ASSERT_THAT(messages, SizeIs(7));
  for (std::size_t i = 1; i < messages.size(); ++i) {
    EXPECT_FALSE(messages[i].payload.equalsIgnoring(messages[i - 1].payload, {"twreporting_timestamp"}));
    EXPECT_EQ(messages[i].category, messages[i - 1].category);
    EXPECT_EQ(messages[i].type, messages[i - 1].type);
  }
}

TEST_F(StreamReporterTest, EndsTheSessionOfAStreamThatLeavesWhileItPlays) {
  clock.advance(1.0);
  update();
  clock.advance(1.0);
  play();
  clock.advance(3.5);
  leave();
  EXPECT_THAT(sent(), ElementsAre("2 on 0.5 Speaker", "6.5 off 0.5 Speaker end 5.5"));
  EXPECT_EQ(sink.only().messages.back().type, 2);
  EXPECT_THAT(sink.only().calls,
              ElementsAre("create", "configure", "start", "message", "message", "stop", "destroy"));
}

TEST_F(StreamReporterTest, SendsAHeldChangeBeforeTheEnd) {
  setRunning(true);
  clock.advance(0.1);
  leave();
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "0.1 off 0.5 Speaker end 0.1"));
}

TEST_F(StreamReporterTest, BeginsASessionForAStreamThatLeavesUndescribed) {
  state.described = false;
  setRunning(true);
  clock.advance(0.1);
  leave();
  EXPECT_THAT(sent(), ElementsAre("0 on 0.5 Speaker", "0.1 off 0.5 Speaker end 0.1"));
  EXPECT_THAT(sink.only().calls,
              ElementsAre("create", "configure", "start", "message", "message", "stop", "destroy"));
}

TEST_F(StreamReporterTest, BeginsASessionForASilentStreamThatLeavesUndescribed) {
  state.described = false;
  update();
  leave();
  ASSERT_THAT(sink.sessions, SizeIs(1));
  EXPECT_THAT(sink.only().calls, ElementsAre("create", "configure", "start", "message", "stop", "destroy"));
}

TEST_F(StreamReporterTest, MeasuresTheSessionByMonotonicTime) {
  play();
  clock.setNow(kBegin - 5000.0);
  clock.advance(1.0);
  leave();
  EXPECT_NEAR(sink.only().messages.back().payload.number("session_duration"), 2.0, 1e-6);
}

TEST_F(StreamReporterTest, BeginsANewSessionWithThePresentStateAtARestart) {
  play();
  setVolume(0.3);
  clock.advance(1.0);
  reports.restartAll();
  clock.advance(2.0);
  leave();
  ASSERT_THAT(sink.sessions, SizeIs(2));
  EXPECT_NE(sink.sessions[0].reporterID, sink.sessions[1].reporterID);
  EXPECT_THAT(sent(1), ElementsAre("2 on 0.3 Speaker", "4 off 0.3 Speaker end 2"));
}

TEST_F(StreamReporterTest, SendsNothingForAPausedStreamInANewSessionUntilItPlays) {
  play();
  setRunning(false);
  reports.restartAll();
  clock.advance(2.0);
  EXPECT_THAT(sent(1), IsEmpty());
  play();
  EXPECT_THAT(sent(1), ElementsAre("3 on 0.5 Speaker"));
}

TEST_F(StreamReporterTest, SendsItsStateAgainInTheSameSession) {
  play();
  clock.advance(1.0);
  reports.resendAll();
  clock.advance(1.0);
  ASSERT_THAT(sink.sessions, SizeIs(1));
  EXPECT_THAT(sent(0), ElementsAre("0 on 0.5 Speaker", "2 on 0.5 Speaker"));
}

TEST_F(StreamReporterTest, SendsAHeldChangeOnceAndWithItsOwnTimeAtAResend) {
  play();
  setVolume(0.3);
  reports.resendAll();
  clock.advance(1.0);
  ASSERT_THAT(sent(0), SizeIs(2));
  EXPECT_EQ(sent(0)[1], "1 on 0.3 Speaker");
}

TEST_F(StreamReporterTest, ResendsNothingForAPausedStreamUntilItPlays) {
  play();
  setRunning(false);
  const std::size_t before = sent(0).size();
  reports.resendAll();
  clock.advance(2.0);
  EXPECT_THAT(sent(0), SizeIs(before));
}

TEST_F(StreamReporterTest, SendsAnOverloadAtOnceWithItsOwnCategoryAndType) {
  play();
  reports.streamOverloaded(kStream, {.time = kBegin + 0.5, .frames = 512, .cycle = 77, .xruns = 2});
  const MemorySessionSink::Message& message = sink.only().messages.back();
  EXPECT_EQ(message.category, 7U);
  EXPECT_EQ(message.type, 6U);
  EXPECT_EQ(message.payload, (ValueMap{{"twreporting_timestamp", kBegin + 0.5},
                                       {"issue_type", "overload"},
                                       {"smallest_buffer_frame_size", 512},
                                       {"io_cycle", 77},
                                       {"xrun_count", 2}}));
}

TEST_F(StreamReporterTest, SendsLaterOverloadsOnceASecond) {
  play();
  for (std::uint32_t i = 1; i <= 15; ++i) {
    reports.streamOverloaded(kStream, {.time = kBegin + 1.0, .frames = 512, .cycle = i, .xruns = 1});
    clock.advance(0.1);
  }
  EXPECT_THAT(overloads(), ElementsAre("cycle 1: 1", "cycle 10: 9"));
  clock.advance(1.0);
  EXPECT_THAT(overloads(), ElementsAre("cycle 1: 1", "cycle 10: 9", "cycle 15: 5"));
  // An overload is sent in time although a change is held too.
  reports.streamOverloaded(kStream, {.time = kBegin, .frames = 512, .cycle = 16, .xruns = 1});
  setVolume(0.25);
  clock.advance(1.0);
  EXPECT_EQ(overloads().back(), "cycle 16: 1");
  EXPECT_EQ(sent().back(), "3.5 on 0.25 Speaker");
}

TEST_F(StreamReporterTest, SendsHeldOverloadsBeforeTheEnd) {
  play();
  reports.streamOverloaded(kStream, {.time = kBegin, .frames = 512, .cycle = 1, .xruns = 1});
  reports.streamOverloaded(kStream, {.time = kBegin, .frames = 512, .cycle = 2, .xruns = 1});
  leave();
  EXPECT_THAT(overloads(), ElementsAre("cycle 1: 1", "cycle 2: 1"));
  EXPECT_EQ(sink.only().messages.back().type, 2U);
}

TEST_F(StreamReporterTest, KeepsAnOverloadUntilTheSessionHasBegun) {
  state.described = false;
  update();
  reports.streamOverloaded(kStream, {.time = kBegin, .frames = 512, .cycle = 1, .xruns = 1});
  EXPECT_THAT(sink.sessions, IsEmpty());
  clock.advance(1.0);
  EXPECT_THAT(overloads(), ElementsAre("cycle 1: 1"));
}

TEST_F(StreamReporterTest, DropsHeldOverloadsAtARestart) {
  play();
  reports.streamOverloaded(kStream, {.time = kBegin, .frames = 512, .cycle = 1, .xruns = 1});
  reports.streamOverloaded(kStream, {.time = kBegin, .frames = 512, .cycle = 2, .xruns = 1});
  reports.restartAll();
  clock.advance(2.0);
  EXPECT_THAT(overloads(1), IsEmpty());
}

TEST_F(StreamReporterTest, IgnoresOverloadsOfUnknownStreams) {
  play();
  reports.streamOverloaded(kStream + 1, {.time = kBegin, .frames = 512, .cycle = 1, .xruns = 1});
  leave();
  reports.streamOverloaded(kStream, {.time = kBegin, .frames = 512, .cycle = 1, .xruns = 1});
  EXPECT_THAT(overloads(), IsEmpty());
  EXPECT_THAT(sink.sessions, SizeIs(1));
}

TEST_F(StreamReporterTest, GivesEachStreamASessionOfItsOwn) {
  update();
  reports.streamChanged(41, state);
  leave();
  reports.streamChanged(kStream, state);
  ASSERT_THAT(sink.sessions, SizeIs(3));
  EXPECT_EQ(sink.sessions[0].calls.back(), "destroy");
  EXPECT_EQ(sink.sessions[1].calls.back(), "start");
  EXPECT_NE(sink.sessions[0].reporterID, sink.sessions[2].reporterID);
}

}  // namespace
}  // namespace tonewerk
