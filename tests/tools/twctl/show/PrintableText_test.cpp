// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/PrintableText.h"

#include <gtest/gtest.h>
#include <string>

namespace tonewerk {
namespace {

TEST(PrintableTextTest, PutsAQuestionMarkForEachControlCharacter) {
  EXPECT_EQ(printable("a\x1b[2Jb\n\x7F"), "a?[2Jb??");
  EXPECT_EQ(printable("\xC2\x80\xC2\x9F"), "??");
  EXPECT_EQ(printable(std::string("\0", 1)), "?");
}

TEST(PrintableTextTest, LeavesOtherCharacters) {
  EXPECT_EQ(printable("Überlauf \xC2\xA0 \xE2\x82\xAC ~"), "Überlauf \xC2\xA0 \xE2\x82\xAC ~");
  EXPECT_EQ(printable("\xC2"), "\xC2");
  EXPECT_EQ(printable(""), "");
}

}  // namespace
}  // namespace tonewerk
