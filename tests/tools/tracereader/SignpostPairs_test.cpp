// SPDX-License-Identifier: Apache-2.0
#include "tools/tracereader/SignpostPairs.h"

#include <gmock/gmock.h>
#include <utility>

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

class SignpostPairsTest : public testing::Test {
 protected:
  void begin(const char* name, std::int64_t at, std::uint64_t identifier = 0, std::int64_t thread = 1,
             std::int64_t process = 1) {
    EXPECT_TRUE(pairs_.add({true, name, identifier, process, thread, at}));
  }
  void end(const char* name, std::int64_t at, std::uint64_t identifier = 0, std::int64_t thread = 1,
           std::int64_t process = 1) {
    EXPECT_TRUE(pairs_.add({false, name, identifier, process, thread, at}));
  }
  std::vector<std::pair<std::string, std::uint64_t>> intervals() const {
    std::vector<std::pair<std::string, std::uint64_t>> found;
    for (const auto& interval : pairs_.intervals()) {
      found.emplace_back(pairs_.names().at(interval.name), interval.nanoseconds);
    }
    return found;
  }

  SignpostPairs pairs_;
};

TEST_F(SignpostPairsTest, ABeginAndItsEndMakeAnInterval) {
  begin("a", 100);
  end("a", 350);
  EXPECT_THAT(intervals(), ElementsAre(Pair("a", 250)));
}

TEST_F(SignpostPairsTest, IntervalsComeInTheOrderOfTheirEnds) {
  begin("outer", 0);
  begin("inner", 10);
  end("inner", 20);
  end("outer", 100);
  EXPECT_THAT(intervals(), ElementsAre(Pair("inner", 10), Pair("outer", 100)));
  EXPECT_EQ(pairs_.intervals().at(0).end, 20);
  EXPECT_EQ(pairs_.intervals().at(1).end, 100);
}

TEST_F(SignpostPairsTest, NestedIntervalsOfOneNameCloseTheNewestFirst) {
  begin("a", 0);
  begin("a", 10);
  end("a", 15);
  end("a", 100);
  EXPECT_THAT(intervals(), ElementsAre(Pair("a", 5), Pair("a", 100)));
}

TEST_F(SignpostPairsTest, IdentifiersTellOverlappingIntervalsApart) {
  begin("a", 0, 1);
  begin("a", 10, 2);
  end("a", 20, 1);
  end("a", 40, 2);
  EXPECT_THAT(intervals(), ElementsAre(Pair("a", 20), Pair("a", 30)));
}

TEST_F(SignpostPairsTest, ThreadsAndProcessesAreKeptApart) {
  begin("a", 0, 0, 1, 1);
  begin("a", 1, 0, 2, 1);
  begin("a", 2, 0, 1, 2);
  end("a", 10, 0, 2, 1);
  end("a", 20, 0, 1, 1);
  end("a", 30, 0, 1, 2);
  EXPECT_THAT(intervals(), ElementsAre(Pair("a", 9), Pair("a", 20), Pair("a", 28)));
}

TEST_F(SignpostPairsTest, IncompleteIntervalsAreLeftOut) {
  end("begun before", 5);
  begin("a", 10);
  end("a", 20);
  begin("ends after", 30);
  EXPECT_THAT(intervals(), ElementsAre(Pair("a", 10)));
  EXPECT_THAT(pairs_.names(), ElementsAre("begun before", "a", "ends after"));
}

TEST_F(SignpostPairsTest, AnEndAfterAnIntervalHasEndedIsLeftOut) {
  begin("a", 10);
  end("a", 20);
  end("a", 30);
  EXPECT_THAT(intervals(), ElementsAre(Pair("a", 10)));
}

TEST_F(SignpostPairsTest, AClockThatWentBackGivesAnIntervalOfNoLength) {
  begin("a", 100);
  end("a", 50);
  EXPECT_THAT(intervals(), ElementsAre(Pair("a", 0)));
}

TEST_F(SignpostPairsTest, HoldsABoundedNumberOfOpenIntervals) {
  for (std::size_t i = 0; i < SignpostPairs::kMaxOpen; ++i) begin("a", 0);
  EXPECT_FALSE(pairs_.add({true, "a", 0, 1, 1, 0}));
  end("a", 1);
  begin("a", 2);
  EXPECT_FALSE(pairs_.add({true, "b", 0, 1, 1, 0}));
}

TEST_F(SignpostPairsTest, NoEventsGiveNoIntervals) {
  EXPECT_THAT(pairs_.names(), IsEmpty());
  EXPECT_THAT(pairs_.intervals(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
