// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/GraphModel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <map>
#include <vector>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

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
  GraphModelTest() { model.complete(); }

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

TEST_F(GraphModelTest, ReportsOutputStreamsOnly) {
  addStream();
  addSink(kSpeaker, "Speaker");
  model.nodeAppeared(60, properties({{kMediaClassKey, "Stream/Input/Audio"}}));
  EXPECT_EQ(observer.states.size(), 1U);
  EXPECT_TRUE(observer.states.contains(kStream));
}

TEST_F(GraphModelTest, KnowsTheApplicationOnceNodeAndClientAreDescribedInEitherOrder) {
  for (const bool clientFirst : {true, false}) {
    model.clear();
    model.complete();
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

TEST_F(GraphModelTest, DescribesAStreamWithoutAClientAtOnce) {
  model.nodeAppeared(kStream, properties({{kMediaClassKey, "Stream/Output/Audio"}, {kNodeNameKey, "tone"}}));
  model.nodeDescribed(kStream, true, {});
  EXPECT_TRUE(stream().described);
  EXPECT_TRUE(stream().running);
  EXPECT_EQ(stream().application, "tone");
}

TEST_F(GraphModelTest, NamesTheSinksThatAStreamIsLinkedTo) {
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

TEST_F(GraphModelTest, NamesASinkThatAppearsAfterItsLink) {
  addStream();
  model.linkAppeared(70, kStream, kSpeaker);
  EXPECT_EQ(stream().device, "");
  addSink(kSpeaker, "Speaker");
  EXPECT_EQ(stream().device, "Speaker");
  model.nodeDescribed(kSpeaker, true, properties({{kNodeDescriptionKey, "Kitchen"}}));
  EXPECT_EQ(stream().device, "Kitchen");
}

TEST_F(GraphModelTest, DoesNotNameARecorderAsADevice) {
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

TEST_F(GraphModelTest, ReportsNoStateTwice) {
  addStream();
  model.nodeDescribed(kStream, true, {});
  const int before = observer.changes;
  model.nodeDescribed(kStream, true, {});
  addSink(kSpeaker, "Speaker");
  model.removed(12345);
  EXPECT_EQ(observer.changes, before);
}

TEST_F(GraphModelTest, ReportsThatAStreamLeftAndForgetsIt) {
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

TEST_F(GraphModelTest, ReportsAllStreamsGoneWhenTheGraphIsCleared) {
  addStream();
  addSink(kSpeaker, "Speaker");
  model.nodeAppeared(41, properties({{kMediaClassKey, "Stream/Output/Audio"}}));
  model.clear();
  EXPECT_THAT(observer.gone, ElementsAre(kStream, 41));
  model.linkAppeared(70, kStream, kSpeaker);
  EXPECT_THAT(observer.states, IsEmpty());
}

// A stream that plays when the bridge starts may be listed before its device. Its first message once lacked
// the device.
TEST_F(GraphModelTest, ReportsNoStreamUntilTheGraphHasBeenDescribed) {
  model.clear();
  addStream();
  model.nodeDescribed(kStream, true, {});
  addSink(kSpeaker, "Speaker");
  model.linkAppeared(70, kStream, kSpeaker);
  EXPECT_EQ(observer.changes, 0);
  model.complete();
  EXPECT_EQ(observer.changes, 1);
  EXPECT_EQ(stream().device, "Speaker");
}

TEST_F(GraphModelTest, ReportsNoStreamThatLeftBeforeTheGraphWasDescribed) {
  model.clear();
  addStream();
  model.removed(kStream);
  model.complete();
  EXPECT_THAT(observer.states, IsEmpty());
  EXPECT_THAT(observer.gone, IsEmpty());
}

TEST_F(GraphModelTest, ListsTheSinksAndSourcesThatDriveOthers) {
  const auto add = [&](std::uint32_t node, const char* mediaClass, const char* driver) {
    const std::string name = "node-" + std::to_string(node);
    model.nodeAppeared(node, properties({{kMediaClassKey, mediaClass}, {kNodeNameKey, name.c_str()}}));
    model.nodeDescribed(node, true, properties({{kNodeDriverKey, driver}}));
  };
  add(1, "Audio/Sink", "true");
  add(2, "Audio/Source", "1");
  add(3, "Audio/Duplex", "true");
  add(4, "Audio/Source/Virtual", "true");
  add(5, "Audio/Sink", "false");
  add(6, "Stream/Output/Audio", "true");
  model.nodeAppeared(7, properties({{kNodeNameKey, "Dummy-Driver"}, {kNodeDriverKey, "true"}}));
  EXPECT_THAT(model.drivers(), ElementsAre(Pair(1, DriverNode{DriverNode::kSink, "node-1"}),
                                           Pair(2, DriverNode{DriverNode::kSource, "node-2"}),
                                           Pair(3, DriverNode{DriverNode::kSink, "node-3"}),
                                           Pair(4, DriverNode{DriverNode::kSource, "node-4"})));
  EXPECT_EQ(model.driverAt(1), (DriverNode{DriverNode::kSink, "node-1"}));
  EXPECT_EQ(model.driverAt(5), std::nullopt);
  EXPECT_EQ(model.driverAt(99), std::nullopt);
}

TEST_F(GraphModelTest, NotifiesWhenItsDriversMayHaveChanged) {
  int changes = 0;
  model.watchDrivers([&] { ++changes; });
  addStream();
  addSink(kSpeaker, "Speaker");
  EXPECT_EQ(changes, 0);
  model.nodeDescribed(kSpeaker, true, properties({{kNodeDriverKey, "true"}}));
  EXPECT_EQ(changes, 1);
  // A driver without a node name is named by its description.
  EXPECT_EQ(model.driverAt(kSpeaker)->name, "Speaker");
  model.removed(kStream);
  EXPECT_EQ(changes, 1);
  model.removed(kSpeaker);
  EXPECT_EQ(changes, 2);
  EXPECT_THAT(model.drivers(), IsEmpty());
  model.clear();
  EXPECT_EQ(changes, 3);
}

TEST_F(GraphModelTest, ShortensTextsOfTheGraph) {
  addStream();
  const std::string endless(1'000'000, 'x');
  model.clientDescribed(kClient, {{std::string(kApplicationIDKey), endless}});
  model.nodeAppeared(
      kSpeaker, {{std::string(kMediaClassKey), "Audio/Sink"}, {std::string(kNodeDescriptionKey), endless}});
  model.linkAppeared(70, kStream, kSpeaker);
  EXPECT_LE(stream().application.size(), 256U);
  EXPECT_LE(stream().device.size(), 256U);
  model.nodeDescribed(kSpeaker, true,
                      {{std::string(kNodeNameKey), endless}, {std::string(kNodeDriverKey), "true"}});
  EXPECT_EQ(model.driverAt(kSpeaker)->name.size(), 256U);
}

TEST_F(GraphModelTest, KnowsWhoseANodeIs) {
  model.clientDescribed(kClient, properties({{kApplicationBinaryKey, "player"},
                                             {kApplicationProcessKey, "77"},
                                             {kSocketProcessKey, "78"}}));
  model.nodeAppeared(60, properties({{kNodeNameKey, "filter"}, {kClientIDKey, "30"}}));
  const NodeOwner owner = model.ownerOf(60);
  EXPECT_EQ(owner.name, "filter");
  EXPECT_EQ(owner.application, "player");
  EXPECT_EQ(owner.process, 78);
  EXPECT_EQ(owner.computingProcess, 78);
  EXPECT_FALSE(owner.isOutputStream);
  EXPECT_EQ(model.ownerOf(61).name, "");
}

TEST_F(GraphModelTest, TakesTheProcessThatAnApplicationSaysOnlyWhereTheKernelDoesNotKnowIt) {
  model.nodeAppeared(60, properties({{kClientIDKey, "30"}}));
  model.clientDescribed(kClient, properties({{kApplicationProcessKey, "77"}}));
  EXPECT_EQ(model.ownerOf(60).process, 77);
  EXPECT_EQ(model.ownerOf(60).computingProcess, 77);
  // The kernel knows only the server through which it speaks.
  model.clientDescribed(kClient, properties({{kSocketProcessKey, "78"}, {kClientAPIKey, "pipewire-pulse"}}));
  EXPECT_EQ(model.ownerOf(60).process, 77);
  EXPECT_EQ(model.ownerOf(60).computingProcess, 78);
}

TEST_F(GraphModelTest, KnowsNoProcessWhenAClientGivesNonsenseForIt) {
  model.clientDescribed(kClient, properties({{kApplicationProcessKey, "-5"}, {kSocketProcessKey, "1e9"}}));
  model.nodeAppeared(60, properties({{kClientIDKey, "30"}}));
  EXPECT_EQ(model.ownerOf(60).process, 0);
  EXPECT_EQ(model.ownerOf(60).computingProcess, 0);
}

TEST_F(GraphModelTest, HasEachPairOfLinkedNodesOnceAndTellsOfChanges) {
  int changes = 0;
  model.watchShape([&] { ++changes; });
  model.linkAppeared(70, 2, 3);
  model.linkAppeared(71, 2, 3);
  model.linkAppeared(72, 1, 2);
  EXPECT_THAT(model.nodeLinks(), ElementsAre(NodeLink{1, 2}, NodeLink{2, 3}));
  EXPECT_EQ(changes, 3);
  model.removed(71);
  EXPECT_THAT(model.nodeLinks(), ElementsAre(NodeLink{1, 2}, NodeLink{2, 3}));
  model.removed(70);
  EXPECT_THAT(model.nodeLinks(), ElementsAre(NodeLink{1, 2}));
  EXPECT_EQ(changes, 5);
  addSink(kSpeaker, "Speaker");
  model.removed(kSpeaker);
  EXPECT_EQ(changes, 7);
}

}  // namespace
}  // namespace tonewerk
