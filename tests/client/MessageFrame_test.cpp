// SPDX-License-Identifier: Apache-2.0
#include "client/MessageFrame.h"

#include <array>
#include <gmock/gmock.h>
#include <string>
#include <vector>

#include "client/OneFrame.h"
#include "client/TestPayload.h"

namespace tonewerk {
namespace {

constexpr double kTime = 1763633999.25;

RingMessage messageOf(const twr_payload& payload) {
  return {TWR_CATEGORY_VOLUME, TWR_TYPE_STATE, kTime, 0, payload.entries, {payload.bytes, payload.size}};
}

std::optional<RpcFrame> framed(const RingMessage& message, std::vector<std::int64_t> reporterIDs = {77},
                               std::optional<std::uint32_t> identifier = std::nullopt,
                               std::uint64_t dropped = 0) {
  std::string bytes;
  appendMessageFrame(bytes, identifier, message, dropped, reporterIDs);
  return frameOf(bytes);
}

Value payloadOf(const std::optional<RpcFrame>& frame) {
  return frame && frame->arguments.size() == 4 && frame->arguments[0] ? *frame->arguments[0] : Value();
}

TEST(MessageFrameTest, IsANotificationWithoutAnIdentifier) {
  TestPayload payload;
  twr_put_double(payload.get(), "level", 0.5);
  const auto frame = framed(messageOf(payload));
  ASSERT_TRUE(frame);
  EXPECT_EQ(frame->kind, RpcFrame::Kind::kNotification);
  EXPECT_EQ(frame->method, "sendMessage");
  ASSERT_EQ(frame->arguments.size(), 4U);
  EXPECT_EQ(*frame->arguments[0], Value(ValueMap{{"level", 0.5}, {"twreporting_timestamp", kTime}}));
  EXPECT_EQ(*frame->arguments[1], Value(TWR_CATEGORY_VOLUME));
  EXPECT_EQ(*frame->arguments[2], Value(TWR_TYPE_STATE));
  EXPECT_EQ(*frame->arguments[3], Value(ValueArray{77}));
}

TEST(MessageFrameTest, IsARequestWithAnIdentifier) {
  const auto frame = framed(messageOf(TestPayload()), {77}, 300);
  ASSERT_TRUE(frame);
  EXPECT_EQ(frame->kind, RpcFrame::Kind::kRequest);
  EXPECT_EQ(frame->identifier, 300U);
}

TEST(MessageFrameTest, AppendsToWhatIsThere) {
  std::string bytes;
  appendMessageFrame(bytes, std::nullopt, messageOf(TestPayload()), 0, {});
  const std::string one = bytes;
  appendMessageFrame(bytes, std::nullopt, messageOf(TestPayload()), 0, {});
  EXPECT_EQ(bytes, one + one);
}

TEST(MessageFrameTest, SaysNilForNoReporterIdentifiers) {
  const auto frame = framed(messageOf(TestPayload()), {});
  ASSERT_TRUE(frame);
  EXPECT_FALSE(frame->arguments[3]);
  EXPECT_FALSE(frame->refused);
}

TEST(MessageFrameTest, NamesSeveralReporterIdentifiers) {
  const auto frame = framed(messageOf(TestPayload()), {1, -2, INT64_MAX});
  ASSERT_TRUE(frame);
  EXPECT_EQ(*frame->arguments[3], Value(ValueArray{1, -2, INT64_MAX}));
}

TEST(MessageFrameTest, CarriesWhatWasDropped) {
  EXPECT_EQ(payloadOf(framed(messageOf(TestPayload()), {77}, std::nullopt, 3)),
            Value(ValueMap{{"twreporting_timestamp", kTime}, {"twreporting_dropped", 3}}));
}

TEST(MessageFrameTest, TellsWhereThePayloadBegins) {
  TestPayload payload;
  twr_put_double(payload.get(), "level", 0.5);
  std::string bytes = "before";
  const std::size_t at = appendMessageFrame(bytes, 7, messageOf(payload), 3, {});
  EXPECT_EQ(bytes.substr(at, payload->size), std::string(payload->bytes, payload->bytes + payload->size));
}

TEST(MessageFrameTest, LeavesAPayloadsOwnTimestamp) {
  TestPayload payload;
  twr_put_double(payload.get(), "a", 1);
  twr_put_double(payload.get(), "twreporting_timestamp", 12.5);
  EXPECT_EQ(payloadOf(framed(messageOf(payload))),
            Value(ValueMap{{"a", 1.0}, {"twreporting_timestamp", 12.5}}));
}

TEST(MessageFrameTest, StampsAPayloadThatSaysTheNameElsewhere) {
  TestPayload payload;
  twr_put_text(payload.get(), "note", "twreporting_timestamp");
  twr_open_map(payload.get(), "inner");
  twr_put_double(payload.get(), "twreporting_timestamp", 12.5);
  twr_close(payload.get());
  twr_open_list(payload.get(), "list");
  twr_put_text(payload.get(), nullptr, "twreporting_timestamp");
  twr_close(payload.get());
  const Value read = payloadOf(framed(messageOf(payload)));
  ASSERT_NE(read.asMap(), nullptr);
  EXPECT_EQ(read.asMap()->number("twreporting_timestamp"), kTime);
  EXPECT_EQ(read.asMap()->size(), 4U);
}

TEST(MessageFrameTest, PassesAnOverwrittenPayloadOn) {
  const std::array<unsigned char, 4> scribbles{0xC1, 0xDF, 0xFF, 0xFF};
  std::string bytes;
  appendMessageFrame(bytes, std::nullopt, {1, 0, kTime, 0, 1, scribbles}, 0, {});
  EXPECT_FALSE(frameOf(bytes));

  std::string named("\xB5twreporting_timestamp\xC1", 23);
  bytes.clear();
  appendMessageFrame(
      bytes, std::nullopt,
      {1, 0, kTime, 0, 1, {reinterpret_cast<const unsigned char*>(named.data()), named.size()}}, 0, {});
  EXPECT_FALSE(frameOf(bytes));
}

TEST(MessageFrameTest, FitsAFrameUpToItsLastByte) {
  const std::size_t most = kMaxFrameBytes - kMessageFrameBytes - 2 * kReporterIDBytes;
  EXPECT_TRUE(fitsMessageFrame(most, 2));
  EXPECT_FALSE(fitsMessageFrame(most + 1, 2));
  EXPECT_FALSE(fitsMessageFrame(0, kMaxFrameBytes));
  EXPECT_FALSE(fitsMessageFrame(SIZE_MAX, 1));

  // The daemon reads a frame that just fits, with all its parts as long as possible.
  TestPayload payload(most);
  std::string text(most - 6, 'x');
  ASSERT_EQ(twr_put_text(payload.get(), "n", text.c_str()), TWR_TOO_LARGE);
  twr_payload_init(payload.get(), payload->bytes, payload->capacity);
  text.pop_back();
  ASSERT_EQ(twr_put_text(payload.get(), "n", text.c_str()), TWR_OK);
  ASSERT_EQ(payload->size, most);
  RingMessage message = messageOf(payload);
  message.category = UINT32_MAX;
  message.type = UINT16_MAX;
  const auto frame = framed(message, {INT64_MIN, INT64_MIN}, UINT32_MAX, UINT64_MAX);
  ASSERT_TRUE(frame);
  EXPECT_EQ(payloadOf(frame).asMap()->text("n"), text);
}

}  // namespace
}  // namespace tonewerk
