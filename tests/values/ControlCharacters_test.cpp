// SPDX-License-Identifier: Apache-2.0
#include "values/ControlCharacters.h"

#include <gtest/gtest.h>
#include <string>

namespace tonewerk {
namespace {

TEST(ControlCharactersTest, AreReplacedByteForByte) {
  EXPECT_EQ(withoutControlCharacters("a\x1b[2Jb\n\x7F\xC3\xBC~"), "a?[2Jb??\xC3\xBC~");
  EXPECT_EQ(withoutControlCharacters("a\nb", ' '), "a b");
  EXPECT_EQ(withoutControlCharacters(std::string("\0", 1)), "?");
}

TEST(ControlCharactersTest, AreReplacedTogetherWithAllBytesBeyondAscii) {
  EXPECT_EQ(printableAscii("a b~\n\x7F\xC3\xBC\xFF"), "a b~?????");
}

}  // namespace
}  // namespace tonewerk
