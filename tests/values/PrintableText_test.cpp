// SPDX-License-Identifier: Apache-2.0
#include "values/PrintableText.h"

#include <gtest/gtest.h>
#include <string>

namespace tonewerk {
namespace {

// All of `first` to `last`, each followed by a comma.
std::string characters(char32_t first, char32_t last) {
  std::string text;
  for (char32_t point = first; point <= last; ++point) {
    if (point < 0x80) {
      text += static_cast<char>(point);
    } else if (point < 0x800) {
      text += static_cast<char>(0xC0 | point >> 6);
      text += static_cast<char>(0x80 | (point & 0x3F));
    } else {
      text += static_cast<char>(0xE0 | point >> 12);
      text += static_cast<char>(0x80 | (point >> 6 & 0x3F));
      text += static_cast<char>(0x80 | (point & 0x3F));
    }
    text += ',';
  }
  return text;
}

TEST(PrintableTextTest, EscapesControlCharactersAsJsonDoes) {
  EXPECT_EQ(printable("a\x1b[2Jb\n\r\t\x7F"), R"(a\u001b[2Jb\n\r\t\u007f)");
  EXPECT_EQ(printable("\xC2\x80\xC2\x85\xC2\x9B\xC2\x9F"), R"(\u0080\u0085\u009b\u009f)");
  EXPECT_EQ(printable(std::string("\0", 1)), R"(\u0000)");
}

TEST(PrintableTextTest, EscapesWhatEndsLinesOrTurnsTheDirectionOfWriting) {
  EXPECT_EQ(printable(characters(0x2028, 0x202E)), R"(\u2028,\u2029,\u202a,\u202b,\u202c,\u202d,\u202e,)");
  EXPECT_EQ(printable(characters(0x2066, 0x2069)), R"(\u2066,\u2067,\u2068,\u2069,)");
  EXPECT_EQ(printable(characters(0x200E, 0x200F)), R"(\u200e,\u200f,)");
  EXPECT_EQ(printable(characters(0x061C, 0x061C)), R"(\u061c,)");
}

TEST(PrintableTextTest, LeavesTheCharactersBesideThem) {
  for (const std::string& text :
       {characters(0x20, 0x7E), characters(0xA0, 0xFF), characters(0x0600, 0x061B),
        characters(0x061D, 0x0640), characters(0x2000, 0x200D), characters(0x2010, 0x2027),
        characters(0x202F, 0x2065), characters(0x206A, 0x20AC), std::string("Überlauf \xF0\x9F\x8E\xB5 \\n"),
        std::string()}) {
    EXPECT_EQ(printable(text), text);
    EXPECT_TRUE(isPrintable(text)) << text;
  }
}

TEST(PrintableTextTest, FindsACharacterAtEveryPlaceOfAText) {
  for (const char c : {'\x01', '\x1F', '\x7F'}) {
    for (std::size_t at = 0; at < 40; ++at) {
      std::string text(40, ' ');
      text[at] = c;
      EXPECT_FALSE(isPrintable(text)) << at;
      EXPECT_EQ(printable(text).size(), 45U) << at;
    }
  }
}

TEST(PrintableTextTest, IsTheSameHoweverOftenATextIsEscaped) {
  const std::string once = printable("\"a\\\x7F\n\"");
  EXPECT_EQ(printable(once), once);
}

TEST(PrintableTextTest, KeepsLineFeedsWhereTheyAreEndsOfLines) {
  EXPECT_EQ(printableLines("first\nsec\rond\x1b\n"), "first\nsec\\rond\\u001b\n");
}

TEST(PrintableTextTest, ReplacesBytesThatAreNotUtf8) {
  EXPECT_EQ(printable("a\x9B\xC2"), "a\xEF\xBF\xBD\xEF\xBF\xBD");
}

}  // namespace
}  // namespace tonewerk
