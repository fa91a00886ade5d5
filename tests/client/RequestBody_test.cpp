// SPDX-License-Identifier: Apache-2.0
#include "client/RequestBody.h"

#include <gtest/gtest.h>

#include "client/OneFrame.h"
#include "client/TestPayload.h"

namespace tonewerk {
namespace {

TEST(RequestBodyTest, MakesARequestAndANotificationOfOneBody) {
  std::string body;
  appendRequestBody(body, "setServiceType", {Value(7), Value(77)});
  for (const std::optional<std::uint32_t> identifier :
       {std::optional<std::uint32_t>(), std::optional<std::uint32_t>(1),
        std::optional<std::uint32_t>(0xFFFFFFFFU)}) {
    std::string bytes;
    appendFrameHead(bytes, identifier);
    EXPECT_LE(bytes.size(), kFrameHeadBytes);
    const std::optional<RpcFrame> frame = frameOf(bytes + body);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->kind, identifier ? RpcFrame::Kind::kRequest : RpcFrame::Kind::kNotification);
    EXPECT_EQ(frame->identifier, identifier.value_or(frame->identifier));
    EXPECT_EQ(frame->method, "setServiceType");
    EXPECT_EQ(frame->arguments, (Arguments{Value(7), Value(77)}));
  }
}

TEST(RequestBodyTest, ReadsAPayloadAsAMap) {
  TestPayload payload;
  twr_put_text(payload.get(), "a", "1");
  twr_open_map(payload.get(), "b");
  twr_put_bool(payload.get(), "c", 1);
  twr_close(payload.get());
  EXPECT_EQ(mapOf(payload), (ValueMap{{"a", "1"}, {"b", ValueMap{{"c", true}}}}));
}

TEST(RequestBodyTest, ReadsNoMapOutOfScribbledMemory) {
  TestPayload payload;
  twr_put_text(payload.get(), "a", "1");
  for (std::uint32_t at = 0; at < payload->size; ++at) {
    for (const int scribble : {0x00, 0xC0, 0xC1, 0xDF, 0xFF}) {
      const auto byte = static_cast<unsigned char>(scribble);
      const unsigned char before = std::exchange(payload->bytes[at], byte);
      const std::optional<ValueMap> map = mapOf(payload);
      EXPECT_FALSE(map && *map == (ValueMap{{"a", "1"}}));
      payload->bytes[at] = before;
    }
  }
  payload->entries = 0xFFFFFFFFU;
  EXPECT_FALSE(mapOf(payload));
}

}  // namespace
}  // namespace tonewerk
