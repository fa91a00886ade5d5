// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/TraceIntervals.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

class TraceIntervalsTest : public testing::Test {
 protected:
  std::optional<TraceIntervals> parse(std::string_view text) { return parseTraceIntervals(text, problem_); }
  std::string problem_;
};

TEST_F(TraceIntervalsTest, KeepsEachNamesIntervalsInTheirOrder) {
  const auto intervals =
      parse("name decode\nname mix\n0 1500 9000\n1 7 20\n0 18446744073709551615 -5\nend\n");
  ASSERT_TRUE(intervals);
  EXPECT_THAT(*intervals, ElementsAre(Pair("decode", ElementsAre(TraceInterval{1500, 9000},
                                                                 TraceInterval{18446744073709551615U, 9015})),
                                      Pair("mix", ElementsAre(TraceInterval{7, 9020}))));
}

TEST_F(TraceIntervalsTest, ATraceMayHoldNothing) {
  const auto intervals = parse("end\n");
  ASSERT_TRUE(intervals);
  EXPECT_THAT(*intervals, IsEmpty());
}

TEST_F(TraceIntervalsTest, NamesMayHoldNewlinesAndBackslashes) {
  const auto intervals = parse("name a\\nb\\\\n \nend\n");
  ASSERT_TRUE(intervals);
  EXPECT_THAT(*intervals, ElementsAre(Pair("a\nb\\n ", IsEmpty())));
}

TEST_F(TraceIntervalsTest, TheReadersMessageIsTheProblem) {
  EXPECT_FALSE(parse("problem the trace has lost 12 events\n"));
  EXPECT_EQ(problem_, "the trace has lost 12 events");
}

TEST_F(TraceIntervalsTest, AnIncompleteAnswerIsRefused) {
  for (const char* text : {"",
                           "name a\n",
                           "name a\n0 1 2\n",
                           "name a\n0 1 2\nend",
                           "end\nname a\n",
                           "end\nend\n",
                           "0 1 2\nend\n",
                           "name a\n1 1 2\nend\n",
                           "name a\n-1 1 2\nend\n",
                           "name a\n0 -1 2\nend\n",
                           "name a\n0\nend\n",
                           "name a\n0 \nend\n",
                           "name a\n0 1\nend\n",
                           "name a\n0 1 \nend\n",
                           "name a\n0 1x 2\nend\n",
                           "name a\n0 1 2x\nend\n",
                           "name a\n01\nend\n",
                           "name a\n0 18446744073709551616 2\nend\n",
                           "name a\n0 1 9223372036854775807\n0 1 1\nend\n",
                           "noise\nend\n",
                           "\nend\n"}) {
    problem_.clear();
    EXPECT_FALSE(parse(text)) << text;
    EXPECT_EQ(problem_, "the trace reader's answer is not whole");
  }
}

}  // namespace
}  // namespace tonewerk
