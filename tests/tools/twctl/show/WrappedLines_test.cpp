// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/WrappedLines.h"

#include <gtest/gtest.h>
#include <sstream>

namespace tonewerk {
namespace {

TEST(WrappedLinesTest, GoOnBelowTheText) {
  std::ostringstream out;
  WrappedLines lines(out, 5, 20);
  lines.add("store", "one two three four");
  lines.add("", "five");
  EXPECT_EQ(out.str(),
            "store  one two three\n"
            "       four\n"
            "       five\n");
}

TEST(WrappedLinesTest, BreakNoWordAndKnowNoLimitWithoutAWidth) {
  std::ostringstream narrow;
  WrappedLines(narrow, 1, 10).add("a", "/a/long/path/to/somewhere b");
  EXPECT_EQ(narrow.str(), "a  /a/long/path/to/somewhere\n   b\n");
  std::ostringstream wide;
  WrappedLines(wide, 1, std::nullopt).add("a", "/a/long/path/to/somewhere b");
  EXPECT_EQ(wide.str(), "a  /a/long/path/to/somewhere b\n");
}

TEST(WrappedLinesTest, ShowSeveralSpacesAsOne) {
  std::ostringstream out;
  WrappedLines(out, 1, std::nullopt).add("a", "  one   two ");
  EXPECT_EQ(out.str(), "a  one two\n");
}

TEST(WrappedLinesTest, CannotControlTheTerminal) {
  std::ostringstream out;
  WrappedLines(out, 1, std::nullopt).add("a", "\x1b[2J\nb");
  EXPECT_EQ(out.str(), "a  \\u001b[2J\\nb\n");
}

}  // namespace
}  // namespace tonewerk
