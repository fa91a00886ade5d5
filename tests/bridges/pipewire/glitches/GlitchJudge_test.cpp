// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/glitches/GlitchJudge.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "bridges/pipewire/glitches/GlitchScene.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

class GlitchJudgeTest : public ::testing::Test {
 protected:
  static constexpr std::uint32_t kPlayer = GlitchScene::kPlayer;
  static constexpr std::uint32_t kFilter = GlitchScene::kFilter;
  static constexpr std::uint32_t kOutput = GlitchScene::kOutput;
  static constexpr std::size_t kGlitch = GlitchScene::kGlitch;

  Verdict judge() const { return judgeGlitch(scene.evidence); }
  ProcessFacts& factsOf(std::uint32_t node) { return scene.evidence.processes[node]; }
  std::chrono::nanoseconds begin() const { return scene.evidence.cycles[kGlitch].cycle.begin; }

  GlitchScene scene;
};

TEST_F(GlitchJudgeTest, BlamesTheNodeThatComputedLongerThanThePeriod) {
  scene.makeLate(kFilter, 30'000);
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.cause, GlitchCause::kLate);
  EXPECT_EQ(verdict.culprit, kFilter);
  EXPECT_NEAR(verdict.overMilliseconds, 30.0 - 21.333, 0.05);
  EXPECT_THAT(verdict.reason, HasSubstr("filter took 29.94 ms"));
}

TEST_F(GlitchJudgeTest, BlamesTheFirstOfAChainAndNotTheLast) {
  scene.makeLate(kPlayer, 25'000);
  EXPECT_EQ(judge().culprit, kPlayer);
  scene.makeLate(kOutput, 25'000);
  EXPECT_EQ(judge().culprit, kOutput);
}

// The filter finishes just in time, so that the output is signalled when the cycle is nearly over.
TEST_F(GlitchJudgeTest, BlamesASlowNodeThatFinishedAndNotTheOneThatHadNoTimeLeft) {
  scene.set(kGlitch,
            {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::finished(kFilter, 40, 60, 21'000),
             GlitchScene::signalled(kOutput, 21'010)});
  scene.set(kGlitch + 1,
            {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::finished(kFilter, 40, 60, 70),
             GlitchScene::finished(kOutput, 80, 150, 160)});
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.culprit, kFilter);
  EXPECT_EQ(verdict.cause, GlitchCause::kLate);
}

TEST_F(GlitchJudgeTest, SaysThatANodeWasNotScheduledThatWokeLateAndWaitedForAProcessor) {
  scene.set(kGlitch, {GlitchScene::signalled(kPlayer, 1), GlitchScene::waiting(kFilter),
                      GlitchScene::waiting(kOutput)});
  scene.set(kGlitch + 1, {GlitchScene::finished(kPlayer, 1, 9'000, 9'010),
                          GlitchScene::finished(kFilter, 9'020, 9'040, 9'050),
                          GlitchScene::finished(kOutput, 9'060, 9'080, 9'090)});
  factsOf(kPlayer) = {.ran = milliseconds(1), .waited = milliseconds(30), .isRealTime = false};
  scene.evidence.machine.holders = {{77, "hog", 90, milliseconds(80)}};
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.cause, GlitchCause::kNotScheduled);
  EXPECT_EQ(verdict.culprit, kPlayer);
  EXPECT_EQ(verdict.holder, 77);
  EXPECT_NEAR(verdict.overMilliseconds, 9.0, 0.05);
  EXPECT_THAT(verdict.reason, HasSubstr("while hog ran for 80.0 ms at real-time priority 90"));
  EXPECT_THAT(verdict.reason, HasSubstr("without a real-time priority"));
}

TEST_F(GlitchJudgeTest, NamesNobodyWhoRanForTooShortToHaveHeldTheProcessor) {
  scene.makeLate(kFilter, 30'000);
  factsOf(kFilter) = {.ran = milliseconds(2), .waited = milliseconds(28)};
  scene.evidence.machine.holders = {{77, "busy", 90, milliseconds(14)}};
  EXPECT_EQ(judge().cause, GlitchCause::kNotScheduled);
  EXPECT_EQ(judge().holder, 0);
  scene.evidence.machine.holders[0].ran = milliseconds(16);
  EXPECT_EQ(judge().holder, 77);
}

TEST_F(GlitchJudgeTest, SaysThatANodeWasNotScheduledThatLostItsProcessorWhileItComputed) {
  scene.makeLate(kFilter, 30'000);
  factsOf(kFilter) = {.ran = milliseconds(2), .waited = milliseconds(28)};
  EXPECT_EQ(judge().cause, GlitchCause::kNotScheduled);
  EXPECT_EQ(judge().culprit, kFilter);
}

TEST_F(GlitchJudgeTest, SaysThatAStoppedProcessIsStuck) {
  for (std::size_t i = kGlitch; i < 5; ++i) {
    scene.set(i, {GlitchScene::signalled(kPlayer, 1), GlitchScene::waiting(kFilter),
                  GlitchScene::waiting(kOutput)});
  }
  scene.evidence.last = 4;
  scene.evidence.isOver = false;
  factsOf(kPlayer) = {.isStopped = true};
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.cause, GlitchCause::kStuck);
  EXPECT_EQ(verdict.culprit, kPlayer);
  EXPECT_NEAR(verdict.overMilliseconds, 42.6, 0.1);
  EXPECT_GT(verdict.confidence, 0.9);
}

// A stop between two samples leaves no other trace.
TEST_F(GlitchJudgeTest, SaysThatANodeIsStuckThatNeitherRanNorWaitedForAProcessor) {
  scene.set(kGlitch, {GlitchScene::signalled(kPlayer, 1), GlitchScene::waiting(kFilter),
                      GlitchScene::waiting(kOutput)});
  scene.set(kGlitch + 1, {GlitchScene::finished(kPlayer, 1, 9'000, 9'010),
                          GlitchScene::finished(kFilter, 9'020, 9'040, 9'050),
                          GlitchScene::finished(kOutput, 9'060, 9'080, 9'090)});
  factsOf(kPlayer) = {.ran = milliseconds(1)};
  EXPECT_EQ(judge().cause, GlitchCause::kStuck);
}

TEST_F(GlitchJudgeTest, BlamesANodeThatWokeTooLateToFinish) {
  scene.set(kGlitch, {GlitchScene::finished(kPlayer, 1, 21, 60), GlitchScene::awake(kFilter, 70, 21'300),
                      GlitchScene::waiting(kOutput)});
  scene.set(kGlitch + 1,
            {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::finished(kFilter, 40, 60, 70),
             GlitchScene::finished(kOutput, 80, 100, 110)});
  factsOf(kFilter) = {.ran = milliseconds(1), .waited = milliseconds(21)};
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.culprit, kFilter);
  EXPECT_EQ(verdict.cause, GlitchCause::kNotScheduled);
  EXPECT_THAT(verdict.reason, HasSubstr("did not wake for 21.23 ms"));
}

// A sample of the kernel's is about many cycles.
TEST_F(GlitchJudgeTest, DoesNotTakeWhatANodeRunsInOtherCyclesForItsGlitch) {
  scene.set(kGlitch, {GlitchScene::signalled(kPlayer, 1), GlitchScene::waiting(kFilter),
                      GlitchScene::waiting(kOutput)});
  scene.set(kGlitch + 1, {GlitchScene::finished(kPlayer, 1, 9'000, 9'010),
                          GlitchScene::finished(kFilter, 9'020, 9'040, 9'050),
                          GlitchScene::finished(kOutput, 9'060, 9'080, 9'090)});
  factsOf(kPlayer) = {.ran = milliseconds(40), .usuallyRuns = milliseconds(39)};
  EXPECT_EQ(judge().cause, GlitchCause::kStuck);
  factsOf(kPlayer).usuallyRuns = milliseconds(20);
  EXPECT_EQ(judge().cause, GlitchCause::kLate);
}

// It notes its finish and loses its processor before it has signalled the output.
TEST_F(GlitchJudgeTest, BlamesANodeThatSignalledTheNextLongAfterItHadFinished) {
  scene.set(kGlitch, {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::finished(kFilter, 40, 60, 70),
                      GlitchScene::signalled(kOutput, 25'000)});
  scene.set(kGlitch + 1,
            {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::finished(kFilter, 40, 60, 70),
             GlitchScene::finished(kOutput, 80, 100, 110)});
  EXPECT_EQ(judge().culprit, kFilter);
  EXPECT_EQ(judge().cause, GlitchCause::kNotScheduled);
  EXPECT_THAT(judge().reason, HasSubstr("finished 24.93 ms before it signalled the next"));
  factsOf(kFilter) = {.ran = milliseconds(1), .waited = milliseconds(25)};
  scene.evidence.machine.holders = {{77, "hog", 90, milliseconds(80)}};
  EXPECT_EQ(judge().holder, 77);
}

TEST_F(GlitchJudgeTest, SaysThatANodeThatWaitedForStorageWasLateForIt) {
  scene.makeLate(kFilter, 50'000);
  factsOf(kFilter) = {.ran = milliseconds(1), .majorFaults = 3};
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.cause, GlitchCause::kLate);
  EXPECT_EQ(verdict.culprit, kFilter);
  EXPECT_THAT(verdict.reason, HasSubstr("storage (3 page faults"));
}

TEST_F(GlitchJudgeTest, TakesTheEndOfALateNodeFromTheCycleThatItFinishedWithIt) {
  scene.set(kGlitch, {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::awake(kFilter, 40, 60),
                      GlitchScene::waiting(kOutput)});
  scene.set(kGlitch + 1,
            {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::finishedBoth(kFilter, 40, 8'000),
             GlitchScene::finished(kOutput, 8'020, 8'040, 8'050)});
  EXPECT_NEAR(judge().overMilliseconds, 8.0, 0.05);
}

TEST_F(GlitchJudgeTest, FollowsALateNodeThroughTheCyclesThatItSpoiled) {
  scene.addInTime();
  scene.set(kGlitch, {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::awake(kFilter, 40, 60),
                      GlitchScene::waiting(kOutput)});
  scene.set(kGlitch + 1, {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::signalled(kFilter, 40),
                          GlitchScene::waiting(kOutput)});
  scene.set(kGlitch + 2,
            {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::finishedBoth(kFilter, 40, 5'000),
             GlitchScene::finished(kOutput, 5'020, 5'040, 5'050)});
  scene.evidence.last = kGlitch + 1;
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.cause, GlitchCause::kLate);
  EXPECT_NEAR(verdict.overMilliseconds, 21.333 + 5.0, 0.05);
}

TEST_F(GlitchJudgeTest, BlamesTheDeviceForAnXrunWithoutALateNode) {
  scene.evidence.deviceXruns = 2;
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.cause, GlitchCause::kDevice);
  EXPECT_EQ(verdict.culprit, 0U);
}

TEST_F(GlitchJudgeTest, BlamesALateNodeForTheXrunOfItsDevice) {
  scene.makeLate(kFilter, 30'000);
  scene.evidence.deviceXruns = 1;
  EXPECT_EQ(judge().culprit, kFilter);
}

TEST_F(GlitchJudgeTest, SaysThatTheGraphChangedWhenOnlyANewNodeIsLate) {
  scene.makeLate(kFilter, 30'000);
  scene.evidence.usual.erase(kFilter);
  EXPECT_EQ(judge().cause, GlitchCause::kGraphChanged);
}

TEST_F(GlitchJudgeTest, SaysThatTheGraphChangedWhenLinksDidShortlyBefore) {
  scene.makeLate(kFilter, 22'000);
  scene.evidence.shapeChanges = {begin() - milliseconds(20)};
  const Verdict verdict = judge();
  EXPECT_EQ(verdict.cause, GlitchCause::kGraphChanged);
  EXPECT_THAT(verdict.reason, HasSubstr("its nodes or links 20 ms before"));
  scene.evidence.shapeChanges = {begin() - seconds(2)};
  EXPECT_EQ(judge().cause, GlitchCause::kLate);
}

// PipeWire's main thread tells of a change some time after its audio thread has made it.
TEST_F(GlitchJudgeTest, SaysThatTheGraphChangedWhenItIsToldAfterACycleWithoutALateNode) {
  scene.set(kGlitch, {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::waiting(kFilter),
                      GlitchScene::waiting(kOutput)});
  scene.evidence.shapeChanges = {begin() - seconds(2), begin() + milliseconds(90)};
  EXPECT_EQ(judge().cause, GlitchCause::kGraphChanged);
}

// A change beside it does not acquit a node whose thread was seen to compute for all that time.
TEST_F(GlitchJudgeTest, BlamesANodeThatComputedAlthoughTheGraphChanged) {
  scene.makeLate(kFilter, 30'000);
  factsOf(kFilter) = {.ran = milliseconds(30)};
  scene.evidence.shapeChanges = {begin() - milliseconds(20)};
  EXPECT_EQ(judge().cause, GlitchCause::kLate);
}

TEST_F(GlitchJudgeTest, SaysThatTheSystemSlept) {
  scene.makeLate(kFilter, 30'000);
  scene.evidence.machine.slept = seconds(5);
  EXPECT_EQ(judge().cause, GlitchCause::kSystemSlept);
}

TEST_F(GlitchJudgeTest, DoesNotKnowWhenNothingWasLate) {
  EXPECT_EQ(judge().cause, GlitchCause::kUnknown);
  EXPECT_LT(judge().confidence, 0.5);
}

// Only a change of links takes a signal away.
TEST_F(GlitchJudgeTest, SaysThatTheGraphChangedWhenANodeWaitsForNobody) {
  scene.set(kGlitch, {GlitchScene::finished(kPlayer, 1, 21, 31), GlitchScene::waiting(kFilter),
                      GlitchScene::waiting(kOutput)});
  EXPECT_EQ(judge().cause, GlitchCause::kGraphChanged);
}

// A program that was killed in the middle of a cycle leaves nodes that wait; those that were slow, but in
// time, are innocent.
TEST_F(GlitchJudgeTest, SaysThatTheGraphChangedWhenANodeLeftAndNoneTookThePeriod) {
  constexpr std::uint32_t kLeaver = 50;
  scene.evidence.cycles[kGlitch - 1].nodes.push_back(GlitchScene::finished(kLeaver, 1, 21, 31));
  scene.set(kGlitch, {GlitchScene::finished(kPlayer, 1, 21, 12'000), GlitchScene::signalled(kFilter, 13'000),
                      GlitchScene::waiting(kOutput)});
  factsOf(kPlayer) = {.ran = milliseconds(60)};
  EXPECT_EQ(judge().cause, GlitchCause::kGraphChanged);
}

TEST_F(GlitchJudgeTest, IsLessSureWhenTwoNodesWereLateAlike) {
  scene.makeLate(kFilter, 30'000);
  const double sure = judge().confidence;
  scene.evidence.cycles[kGlitch].nodes[0] = GlitchScene::awake(kPlayer, 1, 21);
  scene.evidence.cycles[kGlitch + 1].nodes[0] = GlitchScene::finishedBoth(kPlayer, 1, 8'000);
  EXPECT_LT(judge().confidence, sure);
}

TEST_F(GlitchJudgeTest, IsLessSureWhenTheAudioThreadIsNotKnown) {
  scene.makeLate(kFilter, 30'000);
  factsOf(kFilter) = {.ran = milliseconds(2), .waited = milliseconds(28)};
  const Verdict sure = judge();
  factsOf(kFilter).isThreadKnown = false;
  const Verdict unsure = judge();
  EXPECT_EQ(unsure.cause, GlitchCause::kNotScheduled);
  EXPECT_NEAR(unsure.confidence, sure.confidence * 0.8, 1e-9);
  EXPECT_THAT(unsure.reason, HasSubstr("audio thread is not known"));
  factsOf(kFilter).isStopped = true;
  EXPECT_THAT(judge().reason, Not(HasSubstr("not known")));
}

// A client that computes at a real-time priority keeps those beside it from their processor.
TEST_F(GlitchJudgeTest, BlamesTheNodeThatRanAndNotTheOneThatItKeptFromItsProcessor) {
  scene.evidence.links = {{kPlayer, GlitchScene::kSink}, {kFilter, GlitchScene::kSink}};
  scene.set(kGlitch, {GlitchScene::signalled(kPlayer, 1), GlitchScene::awake(kFilter, 1, 21)});
  scene.set(kGlitch + 1,
            {GlitchScene::finished(kPlayer, 1, 9'050, 9'060), GlitchScene::finishedBoth(kFilter, 1, 9'000)});
  factsOf(kPlayer) = {.waited = milliseconds(30)};
  factsOf(kFilter) = {.ran = milliseconds(31)};
  EXPECT_EQ(judge().culprit, kFilter);
}

TEST(GlitchWay, GoesByTheFewestLinks) {
  const std::vector<NodeLink> links = {{1, 2}, {1, 4}, {2, 3}, {3, 4}, {4, 5}};
  EXPECT_THAT(wayThrough(links, 1, 5), ElementsAre(1, 4, 5));
  EXPECT_THAT(wayThrough(links, 5, 1), IsEmpty());
  EXPECT_THAT(wayThrough(links, 3, 3), ElementsAre(3));
}

TEST(GlitchWay, EndsInALoop) {
  EXPECT_THAT(wayThrough(std::vector<NodeLink>{{1, 2}, {2, 1}}, 1, 3), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
