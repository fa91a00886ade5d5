// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/messagepack/RpcWriter.h"

#include <gmock/gmock.h>
#include <limits>
#include <string>

#include "platform/linux/messagepack/RpcFrameReader.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/protobuf/Hex.h"

namespace tonewerk {
namespace {

std::string responseWith(const std::optional<ReplyError>& error, const std::optional<Value>& result) {
  std::string out;
  RpcWriter(out).response(5, error, result);
  return out;
}

TEST(RpcWriterTest, WritesRequestsAndNotifications) {
  std::string out;
  RpcWriter(out).request(300, "m", {Value(1), std::nullopt});
  EXPECT_EQ(out, fromHex("94 00 CD 012C A1 6D 92 01 C0"));
  out.clear();
  RpcWriter(out).notification("m", {});
  EXPECT_EQ(out, fromHex("93 02 A1 6D 90"));
}

TEST(RpcWriterTest, AppendsToTheBuffer) {
  std::string out = "x";
  RpcWriter(out).notification("m", {});
  EXPECT_EQ(out, "x" + fromHex("93 02 A1 6D 90"));
}

TEST(RpcWriterTest, MakesARequestAndANotificationOfOneBody) {
  std::string body;
  RpcWriter(body).body("setServiceType", {Value(7), Value(77)});
  for (const std::optional<std::uint32_t> identifier :
       {std::optional<std::uint32_t>(), std::optional<std::uint32_t>(1),
        std::optional<std::uint32_t>(0xFFFFFFFFU)}) {
    std::string out;
    RpcWriter(out).head(identifier);
    EXPECT_LE(out.size(), RpcWriter::kMaxHeadBytes);
    out += body;
    RpcStrings texts;
    RpcFrameReader reader(texts);
    std::string_view bytes = out;
    ASSERT_EQ(reader.next(bytes), RpcFrameReader::Result::kFrame);
    const RpcFrame& frame = reader.frame();
    EXPECT_EQ(frame.wireBytes, out.size());
    EXPECT_EQ(frame.kind, identifier ? RpcFrame::Kind::kRequest : RpcFrame::Kind::kNotification);
    EXPECT_EQ(frame.identifier, identifier.value_or(frame.identifier));
    EXPECT_EQ(frame.method, "setServiceType");
    EXPECT_EQ(frame.arguments, (Arguments{Value(7), Value(77)}));
  }
}

TEST(RpcWriterTest, WritesSuccessWithTheShortestFormOfTheIdentifier) {
  const auto success = [](std::uint32_t identifier) {
    std::string out = "x";
    RpcWriter(out).response(identifier, std::nullopt, std::nullopt);
    return out.substr(1);
  };
  EXPECT_EQ(success(5), fromHex("94 01 05 C0 C0"));
  EXPECT_EQ(success(0xFFFF), fromHex("94 01 CD FFFF C0 C0"));
  EXPECT_EQ(success(0x10000), fromHex("94 01 CE 00010000 C0 C0"));
  EXPECT_EQ(success(0xFEDCBA98), fromHex("94 01 CE FEDCBA98 C0 C0"));
}

TEST(RpcWriterTest, WritesResults) {
  EXPECT_EQ(responseWith(std::nullopt, Value(true)), fromHex("94 01 05 C0 C3"));
  EXPECT_EQ(responseWith(std::nullopt, std::nullopt), fromHex("94 01 05 C0 C0"));
}

TEST(RpcWriterTest, WritesErrorsAsMapsWithAMessageOnlyWhenThereIsOne) {
  EXPECT_EQ(responseWith(ReplyError{"d", 1, ""}, std::nullopt),
            fromHex("94 01 05 82 A6 646F6D61696E A1 64 A4 636F6465 01 C0"));
  EXPECT_EQ(responseWith(ReplyError{"d", -1, "x"}, std::nullopt),
            fromHex("94 01 05 83 A6 646F6D61696E A1 64 A4 636F6465 FF A7 6D657373616765 A1 78 C0"));
}

TEST(RpcWriterTest, WritesNoResultWithAnError) {
  EXPECT_EQ(responseWith(ReplyError{"d", 1, ""}, Value(1)),
            responseWith(ReplyError{"d", 1, ""}, std::nullopt));
}

TEST(RpcWriterTest, WritesADoubleWithoutFractionAsADouble) {
  EXPECT_EQ(responseWith(std::nullopt, Value(2.0)), fromHex("94 01 05 C0 CB 4000000000000000"));
  EXPECT_EQ(responseWith(std::nullopt, Value(-0.0)), fromHex("94 01 05 C0 CB 8000000000000000"));
}

TEST(RpcWriterTest, WritesWhatTheReaderReads) {
  const ValueMap map{{"numbers", ValueArray{0, -1, INT64_MIN, UINT64_MAX, 0.1, false}},
                     {"nothing", ValueArray{}},
                     {"text", std::string(70'000, 'x')},
                     {"date", Date{-3.25}},
                     {"none", ValueMap{}}};
  std::string out;
  RpcWriter(out).request(1, "m", {Value(map)});
  RpcStrings texts;
  RpcFrameReader reader(texts);
  std::string_view bytes = out;
  ASSERT_EQ(reader.next(bytes), RpcFrameReader::Result::kFrame);
  EXPECT_EQ(reader.frame().arguments, Arguments{Value(map)});
}

Value nested(std::size_t depth) {
  Value value = ValueArray{};
  for (std::size_t at = 1; at < depth; ++at) {
    value = at % 2 == 0 ? Value(ValueArray{value}) : Value(ValueMap{{"k", value}});
  }
  return value;
}

TEST(RpcWriterTest, ChecksTheDepthOfAFrame) {
  // The frame's own array and that of the arguments are the first two.
  EXPECT_TRUE(fitsFrameDepth({Value(1), nested(kMaxFrameDepth - 2)}));
  EXPECT_FALSE(fitsFrameDepth({Value(1), nested(kMaxFrameDepth - 1)}));
  for (const std::size_t depth : {kMaxFrameDepth - 2, kMaxFrameDepth - 1}) {
    std::string out;
    RpcWriter(out).request(1, "m", {nested(depth)});
    RpcStrings texts;
    RpcFrameReader reader(texts);
    std::string_view bytes = out;
    EXPECT_EQ(reader.next(bytes) == RpcFrameReader::Result::kFrame, fitsFrameDepth({nested(depth)}));
  }
}

}  // namespace
}  // namespace tonewerk
