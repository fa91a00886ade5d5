// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SignpostFile.h"

#include <fstream>
#include <gmock/gmock.h>
#include <sstream>
#include <string>
#include <vector>

#include "platform/linux/json/JsonBenchfile.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr SignpostFilter kAll{.reporterID = 77, .since = 1000.0, .until = 2000.0};

class SignpostFileTest : public testing::Test {
 protected:
  std::optional<Signposts> read(const std::string& text, const SignpostFilter& filter = kAll) {
    std::istringstream file(text);
    return readSignposts(file, filter, json_, problem_);
  }
  // "name begin milliseconds"
  std::vector<std::string> intervals(const std::string& lines) {
    std::vector<std::string> found;
    const auto signposts = read(kHead + lines + "\n]}\n");
    EXPECT_TRUE(signposts) << problem_;
    if (!signposts) return found;
    for (const SignpostInterval& one : signposts->intervals) {
      std::ostringstream text;
      text << one.name << ' ' << one.begin << ' ' << one.milliseconds;
      found.push_back(text.str());
    }
    return found;
  }

  const std::string kHead = "{\"context\":{\"reporter_id\":77},\n\"benchmarks\":[\n";
  NlohmannJsonService json_;
  std::string problem_;
};

TEST_F(SignpostFileTest, HasWhatTheDaemonWrites) {
  const TemporaryDirectory directory;
  const ManualClock clock;
  int error = 0;
  const auto writer = JsonBenchfile(clock).open(directory.path("data.bdj"), {"TWReporting", 4, 77}, error);
  ASSERT_NE(writer, nullptr);
  writer->newValue("mix \"loud\"\n", 1.5, 1500.25);
  writer->newValue("decode", 2.0, 1500.5);
  ASSERT_FALSE(writer->close());
  std::ifstream file(directory.path("data.bdj"));
  const auto found = readSignposts(file, kAll, json_, problem_);
  ASSERT_TRUE(found) << problem_;
  ASSERT_EQ(found->intervals.size(), 2U);
  EXPECT_EQ(found->intervals[0].name, "mix \"loud\"\n");
  EXPECT_EQ(found->intervals[0].begin, 1500.25);
  EXPECT_EQ(found->intervals[0].milliseconds, 1.5);
  EXPECT_EQ(found->intervals[1].name, "decode");
  EXPECT_TRUE(found->haveTimes);
}

TEST_F(SignpostFileTest, TakesIntervalsThatBeganWhileTheSessionWasThere) {
  EXPECT_THAT(intervals("{\"name\":\"a\",\"real_time\":1,\"begin\":999.5},\n"
                        "{\"name\":\"b\",\"real_time\":2,\"begin\":1000},\n"
                        "{\"name\":\"c\",\"real_time\":3,\"begin\":2000},\n"
                        "{\"name\":\"d\",\"real_time\":4,\"begin\":2000.5}\n"),
              ElementsAre("b 1000 2", "c 2000 3"));
}

TEST_F(SignpostFileTest, LeavesOutWhatIsNoInterval) {
  EXPECT_THAT(
      intervals("\n[]\nnoise,\n{\"name\":\"a\",\"real_time\":1}\n{\"real_time\":1,\"begin\":1500}\n"
                "{\"name\":\"a\",\"real_time\":-1,\"begin\":1500}\n{\"name\":\"a\",\"real_time\":1e300,"
                "\"begin\":1500}\n{\"name\":\"b\",\"real_time\":1,\"begin\":1500}"),
      ElementsAre("b 1500 1"));
  const auto late = read(kHead + "{\"name\":\"a\",\"real_time\":1,\"begin\":1e300}\n", {.until = 1e301});
  ASSERT_TRUE(late);
  EXPECT_THAT(late->intervals, IsEmpty());
}

TEST_F(SignpostFileTest, KnowsTheFileOfAnEarlierDaemonByItsMissingTimes) {
  const auto found = read("{\"context\":{},\n\"benchmarks\":[\n{\"name\":\"a\",\"real_time\":1}\n]}\n",
                          {.since = 1000.0, .until = 2000.0});
  ASSERT_TRUE(found) << problem_;
  EXPECT_FALSE(found->haveTimes);
  EXPECT_THAT(found->intervals, IsEmpty());
}

TEST_F(SignpostFileTest, TakesNoFileOfAnotherSession) {
  EXPECT_FALSE(read("{\"context\":{\"reporter_id\":78},\n\"benchmarks\":[\n]}\n"));
  EXPECT_EQ(problem_, "it is another session's");
  EXPECT_FALSE(read("{\"context\":{},\n\"benchmarks\":[\n]}\n"));
}

TEST_F(SignpostFileTest, TakesNoOtherFile) {
  for (const char* text : {"", "\n", "noise\n", "{\"context\":[],\n", "{\"contexts\":{},\n", "{}\n"}) {
    problem_.clear();
    EXPECT_FALSE(read(text)) << text;
    EXPECT_EQ(problem_, "it is no benchmark data file of a performance trace");
  }
}

TEST_F(SignpostFileTest, TakesSoManyAndCountsTheOthers) {
  std::string text = kHead;
  for (int count = 0; count < 5; ++count) text += "{\"name\":\"a\",\"real_time\":1,\"begin\":1500},\n";
  SignpostFilter filter = kAll;
  filter.most = 2;
  const auto found = read(text, filter);
  ASSERT_TRUE(found);
  EXPECT_EQ(found->intervals.size(), 2U);
  EXPECT_EQ(found->leftOut, 3U);
}

}  // namespace
}  // namespace tonewerk
