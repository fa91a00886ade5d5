// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/GraphModel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <map>
#include <vector>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

class Observer final : public StreamObserver {
 public:
  void streamChanged(std::uint32_t stream, const StreamState& state) override {
    states[stream] = state;
    ++changes;
  }
  void streamGone(std::uint32_t stream) override {
    states.erase(stream);
    gone.push_back(stream);
  }

  std::map<std::uint32_t, StreamState> states;
  std::vector<std::uint32_t> gone;
  int changes = 0;
};

Properties properties(std::initializer_list<std::pair<std::string_view, const char*>> entries) {
  Properties result;
  for (const auto& [key, value] : entries) result.emplace(key, value);
  return result;
}

class GraphModelTest : public ::testing::Test {
 protected:
  static constexpr std::uint32_t kStream = 40;
  static constexpr std::uint32_t kClient = 30;
  static constexpr std::uint32_t kSpeaker = 50;
  static constexpr std::uint32_t kHeadset = 51;

  void addStream() {
    model.nodeAppeared(kStream, properties({{kMediaClassKey, "Stream/Output/Audio"}, {kClientIDKey, "30"}}));
  }
  void addSink(std::uint32_t node, const char* description) {
    model.nodeAppeared(node,
                       properties({{kMediaClassKey, "Audio/Sink"}, {kNodeDescriptionKey, description}}));
  }
  const StreamState& stream() { return observer.states.at(kStream); }

  Observer observer;
  GraphModel model{observer};
};

TEST_F(GraphModelTest, TellsOfOutputStreamsOnly) {
  addStream();
  addSink(kSpeaker, "Speaker");
  model.nodeAppeared(60, properties({{kMediaClassKey, "Stream/Input/Audio"}}));
  EXPECT_EQ(observer.states.size(), 1U);
  EXPECT_TRUE(observer.states.contains(kStream));
}

TEST_F(GraphModelTest, KnowsWhoPlaysWhenNodeAndClientHaveSpokenInEitherOrder) {
  for (const bool clientFirst : {true, false}) {
    model.clear();
    addStream();
    if (clientFirst) model.clientDescribed(kClient, properties({{kApplicationBinaryKey, "player"}}));
    EXPECT_FALSE(stream().described);
    model.nodeDescribed(kStream, false, properties({{kMediaRoleKey, "Music"}}));
    EXPECT_EQ(stream().described, clientFirst);
    if (!clientFirst) model.clientDescribed(kClient, properties({{kApplicationBinaryKey, "player"}}));
    EXPECT_TRUE(stream().described);
    EXPECT_EQ(stream().application, "player");
    EXPECT_EQ(stream().role, "Music");
  }
}

TEST_F(GraphModelTest, WaitsForNoClientWhereThereIsNone) {
  model.nodeAppeared(kStream, properties({{kMediaClassKey, "Stream/Output/Audio"}, {kNodeNameKey, "tone"}}));
  model.nodeDescribed(kStream, true, {});
  EXPECT_TRUE(stream().described);
  EXPECT_TRUE(stream().running);
  EXPECT_EQ(stream().application, "tone");
}

TEST_F(GraphModelTest, NamesTheSinkThatTheLinksLeadTo) {
  addStream();
  addSink(kSpeaker, "Speaker");
  addSink(kHeadset, "Headset");
  EXPECT_EQ(stream().device, "");
  model.linkAppeared(70, kStream, kSpeaker);
  model.linkAppeared(71, kStream, kSpeaker);
  EXPECT_EQ(stream().device, "Speaker");
  model.linkAppeared(72, kStream, kHeadset);
  EXPECT_EQ(stream().device, "Headset, Speaker");
  model.removed(70);
  model.removed(71);
  EXPECT_EQ(stream().device, "Headset");
  model.removed(kHeadset);
  EXPECT_EQ(stream().device, "");
}

TEST_F(GraphModelTest, NamesASinkThatComesAfterItsLink) {
  addStream();
  model.linkAppeared(70, kStream, kSpeaker);
  EXPECT_EQ(stream().device, "");
  addSink(kSpeaker, "Speaker");
  EXPECT_EQ(stream().device, "Speaker");
  model.nodeDescribed(kSpeaker, true, properties({{kNodeDescriptionKey, "Kitchen"}}));
  EXPECT_EQ(stream().device, "Kitchen");
}

TEST_F(GraphModelTest, TakesNoRecorderForADevice) {
  addStream();
  model.nodeAppeared(60,
                     properties({{kMediaClassKey, "Stream/Input/Audio"}, {kNodeDescriptionKey, "Recorder"}}));
  model.linkAppeared(70, kStream, 60);
  EXPECT_EQ(stream().device, "");
}

TEST_F(GraphModelTest, FollowsVolumeAndFormat) {
  addStream();
  StreamVolume volume;
  volume.channels = {0.125, 0.125};
  model.volumeChanged(kStream, volume);
  EXPECT_EQ(stream().volume, 0.5);
  StreamVolume mute;
  mute.mute = true;
  model.volumeChanged(kStream, mute);
  EXPECT_EQ(stream().volume, 0.0);
  const AudioFormat format{"lpcm", "F32LE", 48'000, 2};
  model.formatChanged(kStream, format);
  EXPECT_EQ(stream().format, format);
}

TEST_F(GraphModelTest, SaysNothingTwice) {
  addStream();
  model.nodeDescribed(kStream, true, {});
  const int before = observer.changes;
  model.nodeDescribed(kStream, true, {});
  addSink(kSpeaker, "Speaker");
  model.removed(12345);
  EXPECT_EQ(observer.changes, before);
}

TEST_F(GraphModelTest, TellsWhenAStreamLeavesAndForgetsIt) {
  addStream();
  model.linkAppeared(70, kStream, kSpeaker);
  model.removed(kStream);
  EXPECT_THAT(observer.gone, ElementsAre(kStream));
  model.volumeChanged(kStream, {});
  model.formatChanged(kStream, {});
  model.nodeDescribed(kStream, true, {});
  model.removed(kStream);
  EXPECT_THAT(observer.states, IsEmpty());
  EXPECT_EQ(observer.gone.size(), 1U);
}

TEST_F(GraphModelTest, EndsEveryStreamWhenTheGraphGoes) {
  addStream();
  addSink(kSpeaker, "Speaker");
  model.nodeAppeared(41, properties({{kMediaClassKey, "Stream/Output/Audio"}}));
  model.clear();
  EXPECT_THAT(observer.gone, ElementsAre(kStream, 41));
  model.linkAppeared(70, kStream, kSpeaker);
  EXPECT_THAT(observer.states, IsEmpty());
}

TEST_F(GraphModelTest, ShortensWhatTheGraphSays) {
  addStream();
  const std::string endless(1'000'000, 'x');
  model.clientDescribed(kClient, {{std::string(kApplicationIDKey), endless}});
  model.nodeAppeared(
      kSpeaker, {{std::string(kMediaClassKey), "Audio/Sink"}, {std::string(kNodeDescriptionKey), endless}});
  model.linkAppeared(70, kStream, kSpeaker);
  EXPECT_LE(stream().application.size(), 256U);
  EXPECT_LE(stream().device.size(), 256U);
}

}  // namespace
}  // namespace tonewerk
