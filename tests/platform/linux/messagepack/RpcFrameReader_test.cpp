// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcFrameReader.h"

#include <chrono>
#include <gmock/gmock.h>
#include <optional>
#include <string>
#include <vector>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "platform/linux/protobuf/Hex.h"

namespace tonewerk {
namespace {

using testing::SizeIs;
using Result = RpcFrameReader::Result;

// "m" as a method.
constexpr const char* kRequestOfM = "94 00 01 A1 6D ";

// A request of "m" with these arguments, which include the header of their array.
std::string requestWith(std::string_view arguments) { return fromHex(kRequestOfM) + fromHex(arguments); }

class RpcFrameReaderTest : public testing::Test {
 protected:
  // Reads `bytes` as one frame and expects that all of them are used.
  RpcFrame read(std::string_view bytes) {
    EXPECT_EQ(reader.next(bytes), Result::kFrame) << reader.problem();
    RpcFrame frame = reader.frame();
    EXPECT_EQ(reader.next(bytes), Result::kNeedsMore);
    EXPECT_TRUE(bytes.empty());
    return frame;
  }

  Result resultOf(std::string_view bytes) { return reader.next(bytes); }

  RpcStrings texts;
  RpcFrameReader reader{texts};
};

// A request whose one argument is a text that makes the frame `size` bytes long.
std::string requestOfSize(std::size_t size) {
  std::string frame;
  RpcWriter(frame).request(1, "m", {Value(std::string(100'000, 'x'))});
  const std::size_t others = frame.size() - 100'000;
  frame.clear();
  RpcWriter(frame).request(1, "m", {Value(std::string(size - others, 'x'))});
  return frame;
}

// A request with `depth` arrays inside each other, the frame's own and that of the arguments counted.
std::string requestOfDepth(std::size_t depth) {
  std::string frame = fromHex(kRequestOfM);
  for (std::size_t open = 2; open < depth; ++open) frame += '\x91';
  return frame + '\x90';
}

TEST_F(RpcFrameReaderTest, ReadsARequest) {
  const RpcFrame frame = read(fromHex("94 00 CE FFFFFFFF A4 6563686F 92 01 A3 6F6E65"));
  EXPECT_EQ(frame.kind, RpcFrame::Kind::kRequest);
  EXPECT_EQ(frame.identifier, 4294967295U);
  EXPECT_EQ(frame.method, "echo");
  EXPECT_EQ(frame.arguments, (Arguments{Value(1), Value("one")}));
  EXPECT_EQ(frame.wireBytes, 18U);
  EXPECT_FALSE(frame.refused);
}

TEST_F(RpcFrameReaderTest, ReadsANotification) {
  const RpcFrame frame = read(fromHex("93 02 A4 6563686F 90"));
  EXPECT_EQ(frame.kind, RpcFrame::Kind::kNotification);
  EXPECT_EQ(frame.method, "echo");
  EXPECT_THAT(frame.arguments, SizeIs(0));
}

TEST_F(RpcFrameReaderTest, ReadsResponses) {
  const RpcFrame result = read(fromHex("94 01 07 C0 92 01 02"));
  EXPECT_EQ(result.kind, RpcFrame::Kind::kResponse);
  EXPECT_EQ(result.identifier, 7U);
  EXPECT_FALSE(result.error);
  EXPECT_EQ(result.result, Value(ValueArray{1, 2}));

  const RpcFrame error = read(fromHex("94 01 08 81 A4 636F6465 05 C0"));
  EXPECT_EQ(error.error, Value(ValueMap{{"code", 5}}));
  EXPECT_FALSE(error.result);
}

TEST_F(RpcFrameReaderTest, AcceptsLongFormsOfShortValues) {
  const RpcFrame frame =
      read(fromHex("DD 00000004 D3 0000000000000000 CF 0000000000000001 DB 00000001 6D DC 0000"));
  EXPECT_EQ(frame.kind, RpcFrame::Kind::kRequest);
  EXPECT_EQ(frame.identifier, 1U);
  EXPECT_EQ(frame.method, "m");
}

TEST_F(RpcFrameReaderTest, ReadsEveryFormOfNumber) {
  const RpcFrame frame = read(requestWith(
      "9C 7F E0 CC FF CD FFFF CE FFFFFFFF CF 7FFFFFFFFFFFFFFF CF FFFFFFFFFFFFFFFF D0 80 D1 8000 D2 80000000 "
      "D3 8000000000000000 CA 3F000000"));
  const Arguments expected{
      Value(127),       Value(-32),        Value(255),  Value(65535),  Value(4294967295),
      Value(INT64_MAX), Value(UINT64_MAX), Value(-128), Value(-32768), Value(INT64_C(-2147483648)),
      Value(INT64_MIN), Value(0.5)};
  EXPECT_EQ(frame.arguments, expected);
  EXPECT_EQ(frame.arguments[5]->kind(), Value::Kind::kInteger);
  EXPECT_EQ(frame.arguments[6]->kind(), Value::Kind::kUnsigned);
  EXPECT_EQ(frame.arguments[11]->kind(), Value::Kind::kDouble);
}

TEST_F(RpcFrameReaderTest, ReadsContainersInsideEachOther) {
  const RpcFrame frame = read(requestWith("91 82 A1 61 93 C2 80 90 A1 62 81 A1 63 CB 3FF0000000000000"));
  const ValueMap expected{{"a", ValueArray{false, ValueMap{}, ValueArray{}}}, {"b", ValueMap{{"c", 1.0}}}};
  EXPECT_EQ(frame.arguments, (Arguments{Value(expected)}));
}

TEST_F(RpcFrameReaderTest, ReadsNilInAnArgumentsPlaceAsNone) {
  const RpcFrame frame = read(requestWith("92 C0 01"));
  EXPECT_EQ(frame.arguments, (Arguments{std::nullopt, Value(1)}));
  EXPECT_FALSE(frame.refused);
}

TEST_F(RpcFrameReaderTest, ReadsDates) {
  const RpcFrame frame =
      read(requestWith("93 D6 FF 0000000A D7 FF 77359400 00000001 C7 0C FF 1DCD6500 FFFFFFFFFFFFFFFF"));
  EXPECT_EQ(frame.arguments, (Arguments{Value(Date{10.0}), Value(Date{1.5}), Value(Date{-0.5})}));
}

TEST_F(RpcFrameReaderTest, KeepsTheLastOfEqualKeysAtTheFirstOnesPosition) {
  const RpcFrame frame = read(requestWith("91 83 A1 61 01 A1 62 02 A1 61 03"));
  ASSERT_TRUE(frame.arguments[0]->asMap());
  EXPECT_EQ(*frame.arguments[0]->asMap(), (ValueMap{{"a", 3}, {"b", 2}}));
  EXPECT_EQ(frame.arguments[0]->asMap()->begin()->key, "a");
}

TEST_F(RpcFrameReaderTest, SharesKeysThatComeAgain) {
  const RpcFrame first = read(requestWith("91 81 A3 6B6579 01"));
  const RpcFrame second = read(requestWith("91 81 A3 6B6579 02"));
  const ValueMapEntry* one = first.arguments[0]->asMap()->begin();
  const ValueMapEntry* other = second.arguments[0]->asMap()->begin();
  EXPECT_TRUE(one->key.sharesStorageWith(other->key));
}

TEST_F(RpcFrameReaderTest, ReadsTheSameByteByByte) {
  std::string frames;
  RpcWriter writer(frames);
  const Arguments arguments{Value(ValueMap{{"text", std::string(300, 'x')}, {"date", Date{1.5}}}), Value(-7)};
  writer.request(1, "first", arguments);
  writer.notification("second", arguments);
  std::vector<RpcFrame> read;
  for (const char byte : frames) {
    std::string_view one(&byte, 1);
    if (reader.next(one) == Result::kFrame) read.push_back(reader.frame());
    ASSERT_TRUE(one.empty());
  }
  ASSERT_THAT(read, SizeIs(2));
  EXPECT_EQ(read[0].method, "first");
  EXPECT_EQ(read[0].arguments, arguments);
  EXPECT_EQ(read[1].method, "second");
  EXPECT_EQ(read[1].arguments, arguments);
}

TEST_F(RpcFrameReaderTest, ReadsManyFramesFromOnePiece) {
  std::string frames;
  for (std::uint32_t at = 0; at < 10'000; ++at) RpcWriter(frames).request(at, "m", {Value(at)});
  std::string_view bytes = frames;
  for (std::uint32_t at = 0; at < 10'000; ++at) {
    ASSERT_EQ(reader.next(bytes), Result::kFrame);
    ASSERT_EQ(reader.frame().identifier, at);
    ASSERT_EQ(reader.frame().arguments, Arguments{Value(at)});
  }
  EXPECT_EQ(reader.next(bytes), Result::kNeedsMore);
}

TEST_F(RpcFrameReaderTest, ReadsTheFrameAfterALongOne) {
  const std::string frames = requestOfSize(500'000) + requestOfSize(200'000) + requestWith("91 05");
  std::string_view bytes = frames;
  ASSERT_EQ(reader.next(bytes), Result::kFrame);
  ASSERT_EQ(reader.next(bytes), Result::kFrame);
  EXPECT_EQ(reader.frame().wireBytes, 200'000U);
  ASSERT_EQ(reader.next(bytes), Result::kFrame);
  EXPECT_EQ(reader.frame().arguments, Arguments{Value(5)});
}

TEST_F(RpcFrameReaderTest, TakesTheLongestFrameByteByByte) {
  const std::string frame = requestOfSize(kMaxFrameBytes);
  for (const char& byte : frame) {
    std::string_view one(&byte, 1);
    const Result expected = &byte == &frame.back() ? Result::kFrame : Result::kNeedsMore;
    ASSERT_EQ(reader.next(one), expected);
  }
  EXPECT_EQ(reader.frame().wireBytes, kMaxFrameBytes);
}

TEST_F(RpcFrameReaderTest, TakesAFrameOfOneMebibyteAndNoneLonger) {
  EXPECT_EQ(resultOf(requestOfSize(kMaxFrameBytes)), Result::kFrame);
  EXPECT_EQ(resultOf(requestOfSize(kMaxFrameBytes + 1)), Result::kBroken);
  EXPECT_EQ(reader.problem(), "a frame that is too long");
}

TEST_F(RpcFrameReaderTest, RefusesAFrameAsSoonAsItIsTooLong) {
  const std::string endless = requestWith("91 DB FFFFFFFF") + std::string(kMaxFrameBytes, 'x');
  EXPECT_EQ(resultOf(endless), Result::kBroken);
}

TEST_F(RpcFrameReaderTest, TakesThirtyTwoContainersInsideEachOtherAndNoMore) {
  EXPECT_EQ(resultOf(requestOfDepth(kMaxFrameDepth)), Result::kFrame);
  EXPECT_EQ(resultOf(requestOfDepth(kMaxFrameDepth + 1)), Result::kBroken);
  EXPECT_EQ(reader.problem(), "a frame nested too deep");
}

TEST_F(RpcFrameReaderTest, StaysBroken) {
  EXPECT_EQ(resultOf(fromHex("C1")), Result::kBroken);
  EXPECT_EQ(resultOf(requestWith("90")), Result::kBroken);
}

struct Malformed {
  const char* name;
  const char* hex;
};

class MalformedFrameTest : public testing::TestWithParam<Malformed> {};

TEST_P(MalformedFrameTest, IsBroken) {
  RpcStrings texts;
  RpcFrameReader reader(texts);
  // A valid frame before it must not make a difference.
  const std::string good = requestWith("91 01");
  std::string_view before = good;
  ASSERT_EQ(reader.next(before), Result::kFrame);
  const std::string bad = fromHex(GetParam().hex);
  std::string_view bytes = bad;
  EXPECT_EQ(reader.next(bytes), Result::kBroken);
  EXPECT_FALSE(reader.problem().empty());
}

INSTANTIATE_TEST_SUITE_P(
    All, MalformedFrameTest,
    testing::Values(
        Malformed{"NeverUsedByte", "C1"}, Malformed{"NeverUsedByteInside", "94 00 01 A1 6D 91 C1"},
        Malformed{"Number", "05"}, Malformed{"Nil", "C0"}, Malformed{"Text", "A1 6D"},
        Malformed{"Map", "81 A1 6D 01"}, Malformed{"EmptyMap", "80"}, Malformed{"Binary", "C4 01 00"},
        Malformed{"Extension", "D4 05 00"}, Malformed{"TextNotUtf8", "A1 FF"}, Malformed{"EmptyArray", "90"},
        Malformed{"TwoElements", "92 00 01"}, Malformed{"FiveElements", "95 00 01 A1 6D 90 90"},
        Malformed{"ArrayOfMany", "DD FFFFFFFF"}, Malformed{"RequestOfThree", "93 00 A1 6D 90"},
        Malformed{"ResponseOfThree", "93 01 07 C0"}, Malformed{"NotificationOfFour", "94 02 01 A1 6D 90"},
        Malformed{"KindThree", "94 03 01 A1 6D 90"}, Malformed{"KindNegative", "94 FF 01 A1 6D 90"},
        Malformed{"KindDouble", "94 CB 0000000000000000"}, Malformed{"KindTrue", "94 C3 01 A1 6D 90"},
        Malformed{"KindNil", "94 C0"}, Malformed{"KindText", "94 A1 30"}, Malformed{"KindArray", "94 90"},
        Malformed{"IdentifierNegative", "94 00 FF A1 6D 90"},
        Malformed{"IdentifierTooLarge", "94 00 CF 0000000100000000"},
        Malformed{"IdentifierLargest", "94 00 CF FFFFFFFFFFFFFFFF"}, Malformed{"IdentifierNil", "94 00 C0"},
        Malformed{"IdentifierText", "94 00 A1 31"}, Malformed{"IdentifierArray", "94 00 90"},
        Malformed{"IdentifierDouble", "94 00 CA 3F800000"}, Malformed{"MethodNumber", "94 00 01 05"},
        Malformed{"MethodNil", "94 00 01 C0"}, Malformed{"MethodBinary", "94 00 01 C4 01 6D"},
        Malformed{"MethodArray", "94 00 01 90"}, Malformed{"MethodMap", "94 00 01 80"},
        Malformed{"MethodNotUtf8", "94 00 01 A1 FF"}, Malformed{"MethodOverlong", "94 00 01 A2 C0 AF"},
        Malformed{"MethodOfNotificationNumber", "93 02 05"}, Malformed{"ArgumentsNil", "94 00 01 A1 6D C0"},
        Malformed{"ArgumentsMap", "94 00 01 A1 6D 80"}, Malformed{"ArgumentsText", "94 00 01 A1 6D A1 6D"},
        Malformed{"ArgumentsNumber", "94 00 01 A1 6D 01"},
        Malformed{"ArgumentsDate", "94 00 01 A1 6D D6 FF 00000000"},
        Malformed{"ArgumentsBinary", "94 00 01 A1 6D C4 00"},
        Malformed{"ArgumentsOfNotificationText", "93 02 A1 6D A0"}),
    [](const auto& tested) { return tested.param.name; });

struct Refused {
  const char* name;
  const char* argument;  // the second of two
  const char* what;
};

class RefusedValueTest : public testing::TestWithParam<Refused> {};

TEST_P(RefusedValueTest, IsNotedWithItsPlaceAndTheNextFrameIsRead) {
  RpcStrings texts;
  RpcFrameReader reader(texts);
  const std::string frames =
      requestWith("93 01") + fromHex(GetParam().argument) + fromHex("03") + requestWith("91 04");
  std::string_view bytes = frames;
  ASSERT_EQ(reader.next(bytes), Result::kFrame) << reader.problem();
  ASSERT_TRUE(reader.frame().refused);
  EXPECT_EQ(reader.frame().refused->argument, 1U);
  EXPECT_STREQ(reader.frame().refused->what, GetParam().what);
  EXPECT_THAT(reader.frame().arguments, SizeIs(3));
  EXPECT_EQ(reader.frame().arguments[2], Value(3));
  ASSERT_EQ(reader.next(bytes), Result::kFrame);
  EXPECT_FALSE(reader.frame().refused);
  EXPECT_EQ(reader.frame().arguments, Arguments{Value(4)});
}

INSTANTIATE_TEST_SUITE_P(
    All, RefusedValueTest,
    testing::Values(Refused{"Binary", "C4 02 0102", "holds binary data"},
                    Refused{"EmptyBinary", "C4 00", "holds binary data"},
                    Refused{"BinaryInMap", "81 A1 61 C4 00", "holds binary data"},
                    Refused{"NilInArray", "91 C0", "holds nil"},
                    Refused{"NilInMap", "81 A1 61 C0", "holds nil"},
                    Refused{"OtherExtension", "D4 05 00", "holds an extension other than a date"},
                    Refused{"EmptyExtension", "C7 00 05", "holds an extension other than a date"},
                    Refused{"DateOfOneByte", "D4 FF 00", "holds a malformed date"},
                    Refused{"DateOfNothing", "C7 00 FF", "holds a malformed date"},
                    Refused{"DateOfSixteenBytes", "D8 FF 00000000000000000000000000000000",
                            "holds a malformed date"},
                    Refused{"DateOfTooManyNanoseconds", "D7 FF EE6B2800 00000000", "holds a malformed date"},
                    Refused{"DateInArray", "91 D4 FF 00", "holds a malformed date"},
                    Refused{"TextNotUtf8", "A1 FF", "holds text that is not UTF-8"},
                    Refused{"TextOverlong", "81 A1 61 A2 C0AF", "holds text that is not UTF-8"},
                    Refused{"TextSurrogate", "A3 EDA080", "holds text that is not UTF-8"},
                    Refused{"KeyNotUtf8", "81 A1 FF 01", "has a key that is not UTF-8"},
                    Refused{"Noncharacter", "A3 EFBFBF", "holds text with a noncharacter"},
                    Refused{"DeepNoncharacter", "81 A1 61 A4 F09FBFBE", "holds text with a noncharacter"},
                    Refused{"KeyNoncharacter", "81 A3 EFB790 01", "has a key with a noncharacter"},
                    Refused{"KeyNumber", "81 01 01", "has a key that is not a text"},
                    Refused{"KeyNil", "81 C0 01", "holds nil"},
                    Refused{"KeyBinary", "81 C4 01 61 01", "holds binary data"},
                    Refused{"KeyArray", "81 91 01 01", "has a key that is not a text"},
                    Refused{"KeyMapOfTexts", "81 81 A1 61 A1 62 01", "has a key that is not a text"},
                    Refused{"KeyTrue", "82 C3 01 A1 62 02", "has a key that is not a text"},
                    Refused{"KeyDate", "81 D6 FF 00000000 01", "has a key that is not a text"},
                    Refused{"FirstOfTwo", "92 C0 C4 00", "holds nil"}),
    [](const auto& tested) { return tested.param.name; });

// Some texts in a daemon's answers do not come from its clients, such as a process's name.
TEST_F(RpcFrameReaderTest, TakesNoncharactersInAnswers) {
  const std::string frame = fromHex("94 01 07 C0 81 A3 EFBFBF A3 EFB790");
  std::string_view bytes = frame;
  ASSERT_EQ(reader.next(bytes), Result::kFrame) << reader.problem();
  EXPECT_FALSE(reader.frame().refused);
  EXPECT_EQ(reader.frame().result, Value(ValueMap{{"\xEF\xBF\xBF", "\xEF\xB7\x90"}}));
}

TEST_F(RpcFrameReaderTest, RefusesMoreArgumentsThanAnyMethodTakes) {
  EXPECT_FALSE(read(requestWith("DC 0010" + std::string(32, '0'))).refused);
  const RpcFrame frame = read(requestWith("DC 0011" + std::string(34, '0')));
  ASSERT_TRUE(frame.refused);
  EXPECT_EQ(frame.refused->argument, 16U);
  EXPECT_THAT(frame.arguments, SizeIs(16));
}

TEST_F(RpcFrameReaderTest, KeepsAFewOfVeryManyArguments) {
  const std::string flood = requestWith("DD 000F0000") + std::string(0xF0000, '\xC0');
  const RpcFrame frame = read(flood);
  EXPECT_TRUE(frame.refused);
  EXPECT_LE(frame.arguments.capacity(), 16U);
}

TEST_F(RpcFrameReaderTest, AllocatesNothingForTheCountInAHeader) {
  // Thirty nested arrays that each announce four thousand million elements. AddressSanitizer would refuse
  // such an allocation.
  std::string frame = fromHex(kRequestOfM) + fromHex("DD FFFFFFFF");
  for (int depth = 0; depth < 15; ++depth) frame += fromHex("DD FFFFFFFF DF FFFFFFFF A1 61");
  EXPECT_EQ(resultOf(frame), Result::kNeedsMore);
}

}  // namespace
}  // namespace tonewerk
