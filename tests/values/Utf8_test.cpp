// SPDX-License-Identifier: Apache-2.0
#include "values/Utf8.h"

#include <cstdint>
#include <gmock/gmock.h>
#include <string>

#include "platform/linux/protobuf/Hex.h"

namespace tonewerk {
namespace {

struct Case {
  const char* name;
  const char* hex;
  bool isText;
};

class Utf8Test : public testing::TestWithParam<Case> {};

TEST_P(Utf8Test, DistinguishesTextFromOtherBytes) {
  const std::string bytes = fromHex(GetParam().hex);
  EXPECT_EQ(isUtf8(bytes), GetParam().isText);
  EXPECT_EQ(isUtf8("eight ascii bytes and more " + bytes), GetParam().isText);
  EXPECT_EQ(isUtf8(bytes + " and more than eight ascii bytes"), GetParam().isText);
}

// Unicode recommends one U+FFFD for the longest beginning of a character, else one for each byte.
struct Repaired {
  const char* name;
  const char* hex;
  const char* text;
};

class RepairedTextTest : public testing::TestWithParam<Repaired> {};

TEST_P(RepairedTextTest, ReplacesEverythingThatIsNotText) {
  const std::string bytes = fromHex(GetParam().hex);
  const std::string text = GetParam().text;
  EXPECT_EQ(validUtf8(bytes), text);
  EXPECT_EQ(validUtf8("eight ascii bytes and \u00E9 " + bytes), "eight ascii bytes and \u00E9 " + text);
  EXPECT_EQ(validUtf8(bytes + " and more than eight"), text + " and more than eight");
  EXPECT_TRUE(isUtf8(validUtf8(bytes)));
}

INSTANTIATE_TEST_SUITE_P(All, RepairedTextTest,
                         testing::Values(Repaired{"Nothing", "", ""}, Repaired{"Ascii", "41 7F", "A\x7F"},
                                         Repaired{"TwoBytes", "C3 A9", "\u00E9"},
                                         Repaired{"ThreeBytes", "E2 82 AC", "\u20AC"},
                                         Repaired{"FourBytes", "F0 9F 8E B5", "\U0001F3B5"},
                                         Repaired{"LoneContinuation", "80 41 BF",
                                                  "\uFFFD"
                                                  "A\uFFFD"},
                                         Repaired{"TwoCutShort", "C3", "\uFFFD"},
                                         Repaired{"ThreeCutShort", "41 E2 82", "A\uFFFD"},
                                         Repaired{"FourCutShort", "F0 9F 8E", "\uFFFD"},
                                         Repaired{"CutShortInTheMiddle", "F0 9F 41 C3 42",
                                                  "\uFFFD"
                                                  "A\uFFFD"
                                                  "B"},
                                         Repaired{"CutShortByAnother", "E2 82 C3 A9", "\uFFFD\u00E9"},
                                         Repaired{"OverlongTwo", "C0 AF", "\uFFFD\uFFFD"},
                                         Repaired{"OverlongThree", "E0 9F BF", "\uFFFD\uFFFD\uFFFD"},
                                         Repaired{"OverlongFour", "F0 8F BF BF", "\uFFFD\uFFFD\uFFFD\uFFFD"},
                                         Repaired{"Surrogate", "ED A0 80", "\uFFFD\uFFFD\uFFFD"},
                                         Repaired{"PastTheLast", "F4 90 80 80", "\uFFFD\uFFFD\uFFFD\uFFFD"},
                                         Repaired{"NoSuchByte", "FE FF", "\uFFFD\uFFFD"}),
                         [](const auto& tested) { return tested.param.name; });

TEST(Utf8CharacterLengthTest, MeasuresOnlyTheFirstCharacter) {
  EXPECT_EQ(utf8CharacterLength("a\xFF"), 1U);
  EXPECT_EQ(utf8CharacterLength("\u20AC\xFF"), 3U);
  EXPECT_EQ(utf8CharacterLength("\xC3"), 0U);
  EXPECT_EQ(utf8CharacterLength("\x80"), 0U);
}

INSTANTIATE_TEST_SUITE_P(
    All, Utf8Test,
    testing::Values(Case{"Nothing", "", true}, Case{"Zero", "00", true}, Case{"Ascii", "41 7F", true},
                    Case{"TwoBytes", "C2 80 DF BF", true}, Case{"ThreeBytes", "E0 A0 80 EF BF BF", true},
                    Case{"BeforeSurrogates", "ED 9F BF", true}, Case{"AfterSurrogates", "EE 80 80", true},
                    Case{"FourBytes", "F0 90 80 80 F4 8F BF BF", true}, Case{"LoneContinuation", "80", false},
                    Case{"OverlongTwo", "C0 AF", false}, Case{"OverlongTwoHigh", "C1 BF", false},
                    Case{"OverlongThree", "E0 9F BF", false}, Case{"OverlongFour", "F0 8F BF BF", false},
                    Case{"FirstSurrogate", "ED A0 80", false}, Case{"LastSurrogate", "ED BF BF", false},
                    Case{"PastTheLast", "F4 90 80 80", false}, Case{"FiveBytes", "F8 88 80 80 80", false},
                    Case{"NoSuchByte", "FF", false}, Case{"TwoCutShort", "C3", false},
                    Case{"ThreeCutShort", "E2 82", false}, Case{"FourCutShort", "F0 9F 98", false},
                    Case{"TwoWithoutItsSecond", "C3 41", false},
                    Case{"ThreeWithoutItsThird", "E2 82 41", false},
                    Case{"FourWithoutItsFourth", "F0 9F 98 41", false}),
    [](const auto& tested) { return tested.param.name; });

std::string encoded(std::uint32_t character) {
  const auto byte = [](std::uint32_t value) { return static_cast<char>(value); };
  const auto next = [&](unsigned shift) { return byte(0x80U | (character >> shift & 0x3FU)); };
  if (character < 0x80) return {byte(character)};
  if (character < 0x800) return {byte(0xC0U | character >> 6U), next(0)};
  if (character < 0x10000) return {byte(0xE0U | character >> 12U), next(6), next(0)};
  return {byte(0xF0U | character >> 18U), next(12), next(6), next(0)};
}

TEST(TextTest, IsEveryCharacterButTheNoncharacters) {
  int refused = 0;
  for (std::uint32_t character = 0; character < 0x110000; ++character) {
    if (character == 0xD800) character = 0xE000;  // skip the surrogates
    const bool isNoncharacter =
        (character & 0xFFFEU) == 0xFFFEU || (character >= 0xFDD0 && character <= 0xFDEF);
    const std::string bytes = encoded(character);
    ASSERT_TRUE(isUtf8(bytes)) << character;
    ASSERT_EQ(isText(bytes), !isNoncharacter) << character;
    ASSERT_EQ(isText("a" + bytes + "z"), !isNoncharacter) << character;
    refused += isNoncharacter ? 1 : 0;
  }
  EXPECT_EQ(refused, 66);
  EXPECT_FALSE(isText("\xFF"));
  EXPECT_FALSE(isText("\xED\xA0\x80"));
}

TEST(Utf8CharactersTest, AreCountedByTheirFirstBytes) {
  EXPECT_EQ(utf8Characters(""), 0U);
  EXPECT_EQ(utf8Characters("a\xC3\xBC\xE2\x82\xAC\xF0\x9F\x8E\xB5"), 4U);
  EXPECT_EQ(utf8Characters("\xFF\xE2\x82"), 2U) << "not well-formed";
}

}  // namespace
}  // namespace tonewerk
