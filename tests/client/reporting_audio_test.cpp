// SPDX-License-Identifier: Apache-2.0
// Tests with a scripted daemon which messages say what a session's audio does.
#include "tonewerk/reporting_audio.h"

#include <cmath>
#include <cstddef>
#include <gmock/gmock.h>
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include "client/ClientTest.h"
#include "tonewerk/reporting_audio.hpp"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::ElementsAreArray;

const std::string kLongest(TWR_MOST_AUDIO_TEXT_BYTES, 'a');
const std::string kTooLong(TWR_MOST_AUDIO_TEXT_BYTES + 1, 'a');

// The text of a message without what differs from run to run: its time, and the length of the activity.
std::string sayingOf(const RpcFrame& frame) {
  if (frame.method != "sendMessage") return textOf(frame);
  ValueMap map = *frame.arguments[0]->asMap();
  EXPECT_TRUE(map.view("twreporting_timestamp"));
  map.erase("twreporting_timestamp");
  if (const auto duration = map.view("session_duration")) {
    EXPECT_GE(duration.number(), 0.0);
    EXPECT_LT(duration.number(), 1000.0);
    map.set("session_duration", 0);
  }
  RpcFrame plain = frame;
  plain.arguments[0] = Value(map);
  return textOf(plain);
}

// What a session or a sender sends that plays on one device and then on another.
constexpr const char* kPlayed[] = {
    "sendMessage {\"active_devices\":\"Speaker\"} 10 18 [77]",
    ("sendMessage {\"session_selected_format\":\"48000 Hz, 2 ch, lpcm\","
     "\"mFormatID\":\"lpcm\",\"mChannelsPerFrame\":2} 8 18 [77]"),
    "sendMessage {\"QMSessionVolume\":0.5} 14 18 [77]",
    "sendMessage {\"session_output_running\":true} 4 18 [77]",
    "sendMessage {\"QMSessionVolume\":0.25} 14 18 [77]",
    "sendMessage {\"active_devices\":\"Headphones\",\"reason\":\"plugged\"} 10 18 [77]",
    "sendMessage {\"session_output_running\":false,\"session_duration\":0} 4 18 [77]"};

class ReportingAudioTest : public ClientTest {
 protected:
  void begin() {
    connection = connectWithSession();
    sender = twr_sender_open(session, 0);
  }
  std::vector<std::string> next(int count) {
    std::vector<std::string> sayings;
    sayings.reserve(static_cast<std::size_t>(count));
    for (int at = 0; at < count; ++at) sayings.push_back(sayingOf(connection->next()));
    return sayings;
  }
  // Proves that nothing was sent before.
  void expectNothing() {
    EXPECT_EQ(send(9), TWR_OK);
    EXPECT_EQ(connection->nextText(), message(9));
  }

  std::unique_ptr<ScriptedConnection> connection;
  twr_sender* sender = nullptr;
};

TEST_F(ReportingAudioTest, SaysWhatASessionPlays) {
  begin();
  EXPECT_EQ(twr_session_device(session, "Speaker"), TWR_OK);
  EXPECT_EQ(twr_session_format(session, 48000, 2, "lpcm"), TWR_OK);
  EXPECT_EQ(twr_session_playing(session, 0.5), TWR_OK);
  EXPECT_EQ(twr_session_volume(session, 0.25), TWR_OK);
  EXPECT_EQ(twr_session_route(session, "Headphones", "plugged"), TWR_OK);
  EXPECT_EQ(twr_session_playing_stopped(session), TWR_OK);
  EXPECT_THAT(next(7), ElementsAreArray(kPlayed));
}

TEST_F(ReportingAudioTest, NamesTheApplication) {
  begin();
  EXPECT_EQ(twr_session_application(session, "org.example.Player"), TWR_OK);
  EXPECT_EQ(connection->nextText(),
            "setConfiguration {\"HostApplicationDisplayID\":\"org.example.Player\"} 77");
}

TEST_F(ReportingAudioTest, SaysTheSameThroughASender) {
  begin();
  EXPECT_EQ(twr_sender_device(sender, "Speaker"), TWR_OK);
  EXPECT_EQ(twr_sender_format(sender, 48000, 2, "lpcm"), TWR_OK);
  EXPECT_EQ(twr_sender_playing(sender, 0.5), TWR_OK);
  EXPECT_EQ(twr_sender_volume(sender, 0.25), TWR_OK);
  EXPECT_EQ(twr_sender_route(sender, "Headphones", "plugged"), TWR_OK);
  EXPECT_EQ(twr_sender_playing_stopped(sender), TWR_OK);
  EXPECT_EQ(twr_sender_recording(sender), TWR_OK);
  EXPECT_EQ(twr_sender_recording_stopped(sender), TWR_OK);
  EXPECT_EQ(twr_sender_overload(sender, nullptr), TWR_OK);
  EXPECT_THAT(next(7), ElementsAreArray(kPlayed));
  EXPECT_THAT(next(3),
              ElementsAre("sendMessage {\"session_input_running\":true} 2 18 [77]",
                          "sendMessage {\"session_input_running\":false,\"session_duration\":0} 2 18 [77]",
                          "sendMessage {\"issue_type\":\"overload\"} 7 6 [77]"));
}

// The time of the activity would end the recording's summary, too.
TEST_F(ReportingAudioTest, SaysTheTimeWithTheLastThatStops) {
  begin();
  EXPECT_EQ(twr_session_recording(session), TWR_OK);
  EXPECT_EQ(twr_session_playing(session, 1), TWR_OK);
  EXPECT_EQ(twr_session_playing_stopped(session), TWR_OK);
  EXPECT_EQ(twr_session_recording_stopped(session), TWR_OK);
  EXPECT_THAT(next(5),
              ElementsAre("sendMessage {\"session_input_running\":true} 2 18 [77]",
                          "sendMessage {\"QMSessionVolume\":1.0} 14 18 [77]",
                          "sendMessage {\"session_output_running\":true} 4 18 [77]",
                          "sendMessage {\"session_output_running\":false} 4 18 [77]",
                          "sendMessage {\"session_input_running\":false,\"session_duration\":0} 2 18 [77]"));
}

TEST_F(ReportingAudioTest, SharesWhatRunsBetweenASessionAndItsSenders) {
  begin();
  EXPECT_EQ(twr_sender_recording(sender), TWR_OK);
  EXPECT_THAT(next(1), ElementsAre("sendMessage {\"session_input_running\":true} 2 18 [77]"));
  EXPECT_EQ(twr_session_recording_stopped(session), TWR_OK);
  EXPECT_EQ(twr_sender_recording_stopped(sender), TWR_OK);  // has nothing to say
  EXPECT_THAT(next(1),
              ElementsAre("sendMessage {\"session_input_running\":false,\"session_duration\":0} 2 18 [77]"));
  expectNothing();
}

TEST_F(ReportingAudioTest, DoesNotStopWhatDoesNotRun) {
  begin();
  EXPECT_EQ(twr_session_playing_stopped(session), TWR_OK);
  EXPECT_EQ(twr_session_recording_stopped(session), TWR_OK);
  expectNothing();
}

TEST_F(ReportingAudioTest, StopsWhatRunsBeforeItsSessionStops) {
  begin();
  EXPECT_EQ(twr_session_recording(session), TWR_OK);
  EXPECT_EQ(twr_session_stop(session, nullptr, nullptr), TWR_OK);
  EXPECT_EQ(twr_session_recording(session), TWR_OK);
  EXPECT_EQ(twr_session_destroy(session, nullptr, nullptr), TWR_OK);
  const std::string started = "sendMessage {\"session_input_running\":true} 2 18 [77]";
  const std::string stopped =
      "sendMessage {\"session_input_running\":false,\"session_duration\":0} 2 18 [77]";
  EXPECT_THAT(next(6), ElementsAre(started, stopped, "stopReportingSessionForID 77", started, stopped,
                                   "destroyReportingSession 77"));
}

TEST_F(ReportingAudioTest, SaysWhatIsKnownOfAnOverload) {
  begin();
  twr_overload overload{};
  overload.size = sizeof(overload);
  EXPECT_EQ(twr_session_overload(session, nullptr), TWR_OK);
  EXPECT_EQ(twr_session_overload(session, &overload), TWR_OK);
  overload.node = "mixer";
  overload.silence_seconds = 0.25;
  overload.buffer_frames = 512;
  overload.io_cycle = 7;
  EXPECT_EQ(twr_session_overload(session, &overload), TWR_OK);
  overload.size = offsetof(twr_overload, buffer_frames);  // as an older program knows it
  EXPECT_EQ(twr_session_overload(session, &overload), TWR_OK);
  EXPECT_THAT(
      next(4),
      ElementsAre(
          "sendMessage {\"issue_type\":\"overload\"} 7 6 [77]",
          "sendMessage {\"issue_type\":\"overload\"} 7 6 [77]",
          "sendMessage {\"issue_type\":\"overload\",\"node\":\"mixer\",\"any_channel_silence_seconds\":0.25,"
          "\"smallest_buffer_frame_size\":512,\"io_cycle\":7} 7 6 [77]",
          "sendMessage {\"issue_type\":\"overload\",\"node\":\"mixer\",\"any_channel_silence_seconds\":0.25}"
          " 7 6 [77]"));
}

TEST_F(ReportingAudioTest, RefusesWhatIsNoVolume) {
  begin();
  for (const double volume : {-0.01, 1.01, std::nan(""), std::numeric_limits<double>::infinity()}) {
    SCOPED_TRACE(volume);
    EXPECT_EQ(twr_session_playing(session, volume), TWR_INVALID);
    EXPECT_EQ(twr_session_volume(session, volume), TWR_INVALID);
    EXPECT_EQ(twr_sender_playing(sender, volume), TWR_INVALID);
    EXPECT_EQ(twr_sender_volume(sender, volume), TWR_INVALID);
  }
  EXPECT_EQ(twr_session_playing_stopped(session), TWR_OK);
  EXPECT_EQ(twr_sender_dropped(sender), 0U);
  expectNothing();
  EXPECT_EQ(twr_session_volume(session, 0), TWR_OK);
  EXPECT_EQ(twr_session_volume(session, 1), TWR_OK);
  EXPECT_THAT(next(2), ElementsAre("sendMessage {\"QMSessionVolume\":0.0} 14 18 [77]",
                                   "sendMessage {\"QMSessionVolume\":1.0} 14 18 [77]"));
}

TEST_F(ReportingAudioTest, RefusesWhatIsNoText) {
  begin();
  for (const char* text : {static_cast<const char*>(nullptr), "", "\xFF"}) {
    EXPECT_EQ(twr_session_application(session, text), TWR_INVALID);
    EXPECT_EQ(twr_session_device(session, text), TWR_INVALID);
    EXPECT_EQ(twr_session_route(session, text, "plugged"), TWR_INVALID);
    EXPECT_EQ(twr_session_route(session, "Speaker", text), TWR_INVALID);
    EXPECT_EQ(twr_session_format(session, 48000, 2, text), TWR_INVALID);
    EXPECT_EQ(twr_sender_device(sender, text), TWR_INVALID);
    EXPECT_EQ(twr_sender_route(sender, "Speaker", text), TWR_INVALID);
    EXPECT_EQ(twr_sender_format(sender, 48000, 2, text), TWR_INVALID);
  }
  twr_overload overload{};
  overload.size = sizeof(overload);
  overload.node = "\xFF";
  EXPECT_EQ(twr_session_overload(session, &overload), TWR_INVALID);
  EXPECT_EQ(twr_sender_dropped(sender), 0U);
  expectNothing();
}

TEST_F(ReportingAudioTest, TakesTextsUpToTheirLongest) {
  begin();
  twr_overload overload{};
  overload.size = sizeof(overload);
  overload.node = kTooLong.c_str();
  EXPECT_EQ(twr_session_application(session, kTooLong.c_str()), TWR_TOO_LARGE);
  EXPECT_EQ(twr_session_device(session, kTooLong.c_str()), TWR_TOO_LARGE);
  EXPECT_EQ(twr_session_route(session, "Speaker", kTooLong.c_str()), TWR_TOO_LARGE);
  EXPECT_EQ(twr_session_format(session, 48000, 2, kTooLong.c_str()), TWR_TOO_LARGE);
  EXPECT_EQ(twr_session_overload(session, &overload), TWR_TOO_LARGE);
  expectNothing();
  constexpr std::uint32_t kMost = std::numeric_limits<std::uint32_t>::max();
  overload = {sizeof(overload), kLongest.c_str(), std::numeric_limits<double>::max(), kMost,
              std::numeric_limits<std::uint64_t>::max()};
  EXPECT_EQ(twr_session_route(session, kLongest.c_str(), kLongest.c_str()), TWR_OK);
  EXPECT_EQ(twr_session_format(session, kMost, kMost, kLongest.c_str()), TWR_OK);
  EXPECT_EQ(twr_session_overload(session, &overload), TWR_OK);
}

TEST_F(ReportingAudioTest, RefusesNumbersOutsideOfTheirRange) {
  begin();
  EXPECT_EQ(twr_session_format(session, 0, 2, "lpcm"), TWR_INVALID);
  EXPECT_EQ(twr_session_format(session, 48000, 0, "lpcm"), TWR_INVALID);
  twr_overload overload{};
  overload.size = sizeof(overload);
  for (const double seconds : {-1.0, std::nan(""), std::numeric_limits<double>::infinity()}) {
    overload.silence_seconds = seconds;
    EXPECT_EQ(twr_session_overload(session, &overload), TWR_INVALID);
  }
  expectNothing();
}

TEST_F(ReportingAudioTest, RefusesNothingForASession) {
  EXPECT_EQ(twr_session_application(nullptr, "a"), TWR_INVALID);
  EXPECT_EQ(twr_session_playing(nullptr, 0.5), TWR_INVALID);
  EXPECT_EQ(twr_sender_playing(nullptr, 0.5), TWR_INVALID);
  EXPECT_EQ(twr_session_playing_stopped(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_sender_playing_stopped(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_recording(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_sender_recording(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_recording_stopped(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_sender_recording_stopped(nullptr), TWR_INVALID);
  EXPECT_EQ(twr_session_volume(nullptr, 0.5), TWR_INVALID);
  EXPECT_EQ(twr_sender_volume(nullptr, 0.5), TWR_INVALID);
  EXPECT_EQ(twr_session_device(nullptr, "a"), TWR_INVALID);
  EXPECT_EQ(twr_sender_device(nullptr, "a"), TWR_INVALID);
  EXPECT_EQ(twr_session_route(nullptr, "a", "b"), TWR_INVALID);
  EXPECT_EQ(twr_sender_route(nullptr, "a", "b"), TWR_INVALID);
  EXPECT_EQ(twr_session_format(nullptr, 1, 1, "a"), TWR_INVALID);
  EXPECT_EQ(twr_sender_format(nullptr, 1, 1, "a"), TWR_INVALID);
  EXPECT_EQ(twr_session_overload(nullptr, nullptr), TWR_INVALID);
  EXPECT_EQ(twr_sender_overload(nullptr, nullptr), TWR_INVALID);
}

// A stop that finds no room may be said again, and the session's end says it otherwise.
TEST_F(ReportingAudioTest, RunsOnWhenItsStopFindsNoRoom) {
  daemon.reset();
  session = twr_session_create(client, 77);
  EXPECT_EQ(twr_session_recording(session), TWR_OK);
  while (send(1) == TWR_OK) {
  }
  EXPECT_EQ(twr_session_recording_stopped(session), TWR_FULL);
  EXPECT_EQ(twr_session_recording_stopped(session), TWR_FULL);  // so it still runs
  EXPECT_EQ(twr_session_playing(session, 0.5), TWR_FULL);
  EXPECT_EQ(twr_session_playing_stopped(session), TWR_OK);  // it has not begun
}

namespace tr = reporting;

class ReportingAudioHppTest : public testing::Test {
 protected:
  ReportingAudioHppTest() {
    tr::ClientOptions options;
    options.socketPath = path;
    client.emplace(std::move(options));
    client->setCloseTimeout(std::chrono::milliseconds(0));
    session.emplace(*client, 77);
    connection = daemon.accept();
    EXPECT_EQ(connection->nextText(), "createReportingSession 77");
  }
  std::vector<std::string> next(int count) {
    std::vector<std::string> sayings;
    sayings.reserve(static_cast<std::size_t>(count));
    for (int at = 0; at < count; ++at) sayings.push_back(sayingOf(connection->next()));
    return sayings;
  }

  const std::string kVolume = "sendMessage {\"QMSessionVolume\":0.5} 14 18 [77]";
  const std::string kPlays = "sendMessage {\"session_output_running\":true} 4 18 [77]";
  const std::string kPlaysNoMore =
      "sendMessage {\"session_output_running\":false,\"session_duration\":0} 4 18 [77]";

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  ScriptedServer daemon{path};
  std::optional<tr::Client> client;
  std::optional<tr::Session> session;
  std::unique_ptr<ScriptedConnection> connection;
};

TEST_F(ReportingAudioHppTest, PlaysAsLongAsItExists) {
  {
    tr::Playing playing(*session, 0.5);
    EXPECT_TRUE(playing);
    EXPECT_EQ(playing.status(), tr::Status::kOk);
    EXPECT_THAT(next(2), ElementsAre(kVolume, kPlays));
    EXPECT_EQ(playing.setVolume(0.25), tr::Status::kOk);
    EXPECT_EQ(playing.setVolume(2), tr::Status::kInvalid);
  }
  EXPECT_THAT(next(2), ElementsAre("sendMessage {\"QMSessionVolume\":0.25} 14 18 [77]", kPlaysNoMore));
}

TEST_F(ReportingAudioHppTest, StopsOnlyOnceWhoeverHasIt) {
  tr::Playing first(*session, 0.5);
  tr::Playing second(std::move(first));
  EXPECT_FALSE(first);  // NOLINT(bugprone-use-after-move): that is what is tested
  EXPECT_EQ(first.stop(), tr::Status::kInvalid);
  EXPECT_EQ(first.setVolume(0.5), tr::Status::kInvalid);
  EXPECT_EQ(second.stop(), tr::Status::kOk);
  EXPECT_FALSE(second);
  EXPECT_EQ(second.stop(), tr::Status::kInvalid);
  EXPECT_EQ(tr::reportDevice(*session, "Speaker"), tr::Status::kOk);
  EXPECT_THAT(next(4), ElementsAre(kVolume, kPlays, kPlaysNoMore,
                                   "sendMessage {\"active_devices\":\"Speaker\"} 10 18 [77]"));
}

TEST_F(ReportingAudioHppTest, EndsWhatItReplaces) {
  tr::RecordingInput recording(*session);
  recording = tr::RecordingInput(*session);
  const std::string records = "sendMessage {\"session_input_running\":true} 2 18 [77]";
  EXPECT_THAT(next(3),
              ElementsAre(records, records,
                          "sendMessage {\"session_input_running\":false,\"session_duration\":0} 2 18 [77]"));
}

TEST_F(ReportingAudioHppTest, KeepsItsSessionAlive) {
  {
    const tr::Playing playing(*session, 0.5);
    session.reset();
    EXPECT_THAT(next(2), ElementsAre(kVolume, kPlays));
  }
  EXPECT_THAT(next(2), ElementsAre(kPlaysNoMore, "destroyReportingSession 77"));
}

TEST_F(ReportingAudioHppTest, PlaysThroughASender) {
  tr::Sender sender(*session);
  {
    const tr::Playing playing(sender, 0.5);
    EXPECT_EQ(tr::reportOverload(sender, {"mixer", 0, 512, 0}), tr::Status::kOk);
  }
  EXPECT_THAT(
      next(4),
      ElementsAre(
          kVolume, kPlays,
          "sendMessage {\"issue_type\":\"overload\",\"node\":\"mixer\",\"smallest_buffer_frame_size\":512}"
          " 7 6 [77]",
          kPlaysNoMore));
}

TEST_F(ReportingAudioHppTest, SaysWhyItHasNotBegun) {
  const tr::Playing wrong(*session, 2);
  EXPECT_FALSE(wrong);
  EXPECT_EQ(wrong.status(), tr::Status::kInvalid);
  tr::Session nothing(std::move(*session));
  tr::Session empty(std::move(nothing));
  tr::Playing none(nothing, 0.5);  // NOLINT(bugprone-use-after-move): that is what is tested
  EXPECT_EQ(none.status(), tr::Status::kInvalid);
}

}  // namespace
}  // namespace tonewerk
