// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/glitches/GlitchPicture.h"

#include <gmock/gmock.h>
#include <sstream>
#include <string>

#include "values/Utf8.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::Not;

class GlitchPictureTest : public testing::Test {
 protected:
  GlitchPictureTest() {
    cycles_.push_back({-1000.0, 1000.0, {{"studio", "studio", 0.0, 0.0, 500.0}}});
    cycles_.push_back(
        {0.0, 1000.0, {{"studio", "studio", 0.0, 500.0, 2000.0}, {"player", "mpv", 2000.0, {}, {}}}});
  }
  std::string draw(GlitchPicture::Look look) const { return GlitchPicture(look).draw(cycles_); }
  static std::size_t widest(const std::string& text) {
    std::size_t most = 0;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) most = std::max(most, utf8Characters(line));
    return most;
  }

  std::vector<GlitchCycle> cycles_;
};

// 60 columns: 41 of them for 2.1 ms, so the deadline is in column 19 of these.
TEST_F(GlitchPictureTest, ShowsWhoWaitedWhoRanAndWhoWentBeyondTheDeadline) {
  EXPECT_EQ(draw({.width = 60, .isUnicode = false, .isColoured = false}),
            "the cycle 1 ms before, of 1 ms\n"
            "  studio #########          |                      0.5 ms\n"
            "the glitch's cycle, of 1 ms\n"
            "  studio .........##########|XXXXXXXXXXXXXXXXXXX   2 ms\n"
            "  player                    |                   .> not woken\n");
}

TEST_F(GlitchPictureTest, HasOtherSignsWhereTheTerminalKnowsThem) {
  const std::string text = draw({.width = 60, .isUnicode = true, .isColoured = false});
  EXPECT_THAT(text, HasSubstr("\u2588\u2502\u2593"));
  EXPECT_THAT(text, Not(HasSubstr("#")));
  EXPECT_EQ(widest(text), 60U);
}

TEST_F(GlitchPictureTest, FitsSixtyColumnsWhateverTheNames) {
  cycles_[1].nodes.push_back({std::string(90, 'n') + "\u00e9", "p", 0.0, 1.0, {}});
  cycles_[1].nodes.push_back({"\x1b[31m\u202e", "p", 0.0, 1.0, 1e9});
  for (const bool isUnicode : {false, true}) {
    const std::string text = draw({.width = 60, .isUnicode = isUnicode, .isColoured = false});
    EXPECT_LE(widest(text), 60U) << text;
    EXPECT_THAT(text, HasSubstr("no answer"));
    EXPECT_THAT(text, Not(HasSubstr("\x1b")));
    EXPECT_THAT(text, Not(HasSubstr("\u202e")));
  }
}

TEST_F(GlitchPictureTest, HasColoursOnlyWhereTheyAreWanted) {
  EXPECT_THAT(draw({.width = 60, .isUnicode = true, .isColoured = false}), Not(HasSubstr("\x1b")));
  const std::string text = draw({.width = 60, .isUnicode = true, .isColoured = true});
  EXPECT_THAT(text, HasSubstr("\x1b[31m\u2593"));
  EXPECT_THAT(text, HasSubstr("\u2593\x1b[0m   2 ms\n"));
}

// One that never answers would make the others too small to see.
TEST_F(GlitchPictureTest, EndsAfterFourPeriods) {
  cycles_[1].nodes[0].finish = 1e6;
  EXPECT_THAT(draw({.width = 60, .isUnicode = false, .isColoured = false}),
              HasSubstr("  studio .....#####|XXXXXXXXXXXXXXXXXXXXXXXXXXXXX> 1 s\n"));
}

TEST_F(GlitchPictureTest, ShowsTwoCyclesBeforeAndTwoAfter) {
  for (int i = 2; i < 9; ++i) {
    cycles_.insert(cycles_.begin(), {-1000.0 * i, 1000.0, {}});
    cycles_.push_back({1000.0 * i, 1000.0, {}});
  }
  const std::string text = draw({});
  EXPECT_THAT(text, HasSubstr("the cycle 2 ms before, of 1 ms\n  no node ran\nthe cycle 1 ms before"));
  EXPECT_THAT(text, HasSubstr("the cycle 3 ms after, of 1 ms\n"));
  EXPECT_THAT(text, Not(HasSubstr("3 ms before")));
  EXPECT_THAT(text, Not(HasSubstr("4 ms after")));
}

TEST_F(GlitchPictureTest, OfNoCyclesIsEmpty) {
  cycles_.clear();
  EXPECT_EQ(draw({}), "");
}

}  // namespace
}  // namespace tonewerk
