// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/Utf8.h"

#include <gmock/gmock.h>
#include <string>

#include "platform/linux/Hex.h"

namespace tonewerk {
namespace {

struct Case {
  const char* name;
  const char* hex;
  bool isText;
};

class Utf8Test : public testing::TestWithParam<Case> {};

TEST_P(Utf8Test, TellsTextFromOtherBytes) {
  const std::string bytes = fromHex(GetParam().hex);
  EXPECT_EQ(isUtf8(bytes), GetParam().isText);
  EXPECT_EQ(isUtf8("eight ascii bytes and more " + bytes), GetParam().isText);
  EXPECT_EQ(isUtf8(bytes + " and more than eight ascii bytes"), GetParam().isText);
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

}  // namespace
}  // namespace tonewerk
