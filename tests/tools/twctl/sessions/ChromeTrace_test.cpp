// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/ChromeTrace.h"

#include <gmock/gmock.h>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/linux/json/NlohmannJsonService.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

constexpr double kBegin = 1'763'633'880.25;

class ChromeTraceTest : public testing::Test {
 protected:
  ChromeTraceTest() {
    played(0.0, 3.0, "Speaker", 0.5);
    played(3.0, 10.0, "Speaker", 0.25);
    played(12.0, 20.0, "Headphones", 0.75);
    records_.stretches.push_back({4, "Input", kBegin + 1.0, kBegin + 4.0, 3.0, "Microphone", {}});
    records_.issues.push_back({5, kBegin + 2.5, "overload", "mixer", 0.5, 256});
  }

  void played(double from, double until, const std::string& device, double volume) {
    records_.stretches.push_back({static_cast<std::int64_t>(records_.stretches.size()) + 1, "Volume",
                                  kBegin + from, kBegin + until, until - from, device, volume});
  }

  // A glitch whose node "studio" took 8 ms of 5 ms, and the cycle after it. "player" did not wake in time.
  void glitched(std::int64_t event, double at) {
    GlitchVerdict verdict;
    verdict.event = event;
    verdict.at = kBegin + at;
    verdict.id = "1-1";
    verdict.cause = "late";
    verdict.culpritApplication = "Studio";
    verdict.reason = "studio took 8 ms of 5 ms.";
    records_.issues.push_back({event, kBegin + at + 0.5, "overload", {}, {}, 256, verdict});
    cycles_[event] = {
        {0.0, 5000.0, {{"studio", "studio", 10.0, 20.0, 8000.0}, {"player", "", 8000.0, {}, {}}}},
        {5000.0, 5000.0, {{"studio", "studio", 10.0, 20.0, 3500.0}, {"player", "", 3500.0, 3510.0, 4000.0}}}};
  }
  ValueMap trace() const {
    const NlohmannJsonService json;
    std::string problem;
    const auto value = json.parse(chromeTrace(session_, records_, cycles_, signposts_), problem);
    EXPECT_TRUE(value) << problem;
    return value && value->asMap() != nullptr ? *value->asMap() : ValueMap();
  }
  // The events of a phase as "name ts[+dur][ =volume]".
  std::vector<std::string> events(const std::string& phase) const {
    std::vector<std::string> found;
    const ValueMap all = trace();
    for (const Value& value : *all.find("traceEvents")->asArray()) {
      const ValueMap& event = *value.asMap();
      if (event.text("ph") != phase) continue;
      found.push_back(event.text("name") + " " + event.text("ts"));
      if (event.contains("dur")) found.back() += "+" + event.text("dur");
      if (phase == "C") found.back() += " =" + event.find("args")->asMap()->text("volume");
    }
    return found;
  }

  StoredSession session_{.id = 41,
                         .reporterID = 7,
                         .service = "longformaudio",
                         .application = "org.example.\"Player\"\n",
                         .user = 1000,
                         .startedAt = kBegin,
                         .endedAt = kBegin + 21.0,
                         .ending = "stopped"};
  SessionRecords records_;
  std::map<std::int64_t, std::vector<GlitchCycle>> cycles_;
  std::vector<SignpostInterval> signposts_;
};

// The rules of the format: which fields each phase needs, and what viewers expect of them.
TEST_F(ChromeTraceTest, KeepsTheRulesOfTheFormat) {
  glitched(6, 2.0);
  glitched(7, 2.005);
  signposts_ = {{"decode", kBegin + 2.0, 1.5}, {"decode", kBegin + 2.001, 1.5}};
  const ValueMap all = trace();
  double last = 0.0;
  std::map<std::pair<std::int64_t, std::int64_t>, double> busyUntil;  // by process and thread
  std::map<std::pair<std::int64_t, std::int64_t>, std::string> threads;
  std::set<std::int64_t> open;  // asynchronous slices
  for (const Value& value : *all.find("traceEvents")->asArray()) {
    ASSERT_NE(value.asMap(), nullptr);
    const ValueMap& event = *value.asMap();
    const std::string phase = event.text("ph");
    for (const char* field : {"name", "ph", "ts", "pid", "tid"}) EXPECT_TRUE(event.contains(field)) << field;
    EXPECT_THAT(phase, testing::AnyOf("M", "X", "C", "i", "b", "e"));
    const double at = event.number("ts");
    EXPECT_GE(at, last) << "not sorted";
    last = at;
    const std::pair thread(event.integer("pid"), event.integer("tid"));
    if (phase == "M") {
      ASSERT_TRUE(event.contains("args"));
      EXPECT_NE(event.find("args")->asMap()->text("name"), "");
      threads[thread] = event.find("args")->asMap()->text("name");
      continue;
    }
    EXPECT_TRUE(threads.contains(thread)) << "thread without a name";
    if (phase == "X") {
      ASSERT_TRUE(event.contains("dur"));
      EXPECT_GE(event.number("dur"), 0.0);
      EXPECT_GE(at, busyUntil[thread]) << "slices of one thread overlap";
      busyUntil[thread] = at + event.number("dur");
    }
    if (phase == "b") EXPECT_TRUE(open.insert(event.integer("id")).second) << "a number twice";
    if (phase == "e") EXPECT_EQ(open.erase(event.integer("id")), 1U) << "an end without a begin";
    if (phase == "i") EXPECT_EQ(event.text("s"), "t");
    if (phase == "C") EXPECT_NE(event.find("args")->asMap()->find("volume")->asDouble(), nullptr);
  }
  EXPECT_THAT(open, testing::IsEmpty());
  EXPECT_EQ(threads.at({1, 0}), "session 41: org.example.\"Player\"\n");
}

TEST_F(ChromeTraceTest, HasASliceForEachStretchAndDevice) {
  EXPECT_THAT(events("X"),
              ElementsAre("longformaudio 0+21000000", "Speaker 0+10000000", "Volume 0+3000000",
                          "Input 1000000+3000000", "Microphone 1000000+3000000", "Volume 3000000+7000000",
                          "Volume 12000000+8000000", "Headphones 12000000+8000000"));
}

TEST_F(ChromeTraceTest, CountsTheVolumeWhichIsNothingWhileNothingPlays) {
  EXPECT_THAT(events("C"), ElementsAre("volume 0 =0.5", "volume 3000000 =0.25", "volume 10000000 =0",
                                       "volume 12000000 =0.75", "volume 20000000 =0"));
}

TEST_F(ChromeTraceTest, HasTheCyclesAroundAGlitchAsSlicesOnATrackForEachNode) {
  records_ = {};
  glitched(6, 2.0);
  EXPECT_THAT(events("X"), ElementsAre("longformaudio 0+21000000", "the glitch's cycle 2000000+5000",
                                       "waits 2000010+10", "runs 2000020+7980", "cycle 2005000+5000",
                                       "runs 2008000+500", "waits 2008500+10", "runs 2008510+490"));
  EXPECT_THAT(events("i"), ElementsAre("glitch: late 2000000", "overload 2500000"));
  const std::string text = chromeTrace(session_, records_, cycles_);
  EXPECT_THAT(text, HasSubstr(R"x("name":"studio (studio)")x"));
  EXPECT_THAT(text, HasSubstr(R"("name":"player")"));
  EXPECT_THAT(text, HasSubstr("studio took 8 ms of 5 ms."));
}

TEST_F(ChromeTraceTest, HasACycleNearTwoGlitchesOnce) {
  records_ = {};
  glitched(6, 2.0);
  glitched(7, 2.005001);  // the clock of the second message was read a little later
  std::vector<std::string> cycles;
  for (const std::string& slice : events("X")) {
    if (slice.find("cycle") != std::string::npos) cycles.push_back(slice);
  }
  EXPECT_THAT(cycles,
              ElementsAre("the glitch's cycle 2000000+5000", "cycle 2005000+5000", "cycle 2010001+5000"));
  EXPECT_THAT(events("i"), testing::Contains("glitch: late 2005001"));
}

TEST_F(ChromeTraceTest, HasTheIntervalsOfSignpostsWhichMayOverlap) {
  signposts_ = {
      {"mix", kBegin + 2.001, 0.25}, {"decode", kBegin + 2.0, 1.5}, {"decode", kBegin + 2.001, 1.5}};
  EXPECT_THAT(events("b"), ElementsAre("decode 2000000", "mix 2001000", "decode 2001000"));
  EXPECT_THAT(events("e"), ElementsAre("mix 2001250", "decode 2001500", "decode 2002500"));
  EXPECT_THAT(chromeTrace(session_, records_, cycles_, signposts_),
              HasSubstr(R"("name":"process_name","ph":"M","pid":3)"));
  EXPECT_THAT(chromeTrace(session_, records_, cycles_), Not(HasSubstr("signposts")));
}

TEST_F(ChromeTraceTest, MarksIssues) { EXPECT_THAT(events("i"), ElementsAre("overload 2500000")); }

TEST_F(ChromeTraceTest, BeginsWithAStretchThatBeganBeforeTheSession) {
  played(-2.0, -1.0, "Speaker", 0.5);
  EXPECT_THAT(events("X"), testing::Contains("longformaudio 2000000+21000000"));
  EXPECT_THAT(events("i"), ElementsAre("overload 4500000"));
}

TEST_F(ChromeTraceTest, LetsARunningSessionLastUntilWhatIsKnown) {
  session_.endedAt.reset();
  EXPECT_THAT(events("X"), testing::Contains("longformaudio 0+20000000"));
}

TEST_F(ChromeTraceTest, LeavesOutStretchesWithoutTimes) {
  records_.stretches.push_back({9, "Gather", {}, kBegin, 1.0, "Speaker", {}});
  EXPECT_THAT(chromeTrace(session_, records_), Not(HasSubstr("Gather")));
}

}  // namespace
}  // namespace tonewerk
