// SPDX-License-Identifier: Apache-2.0
#include "client/RequestBody.h"

#include <gtest/gtest.h>

#include "client/TestPayload.h"

namespace tonewerk {
namespace {

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
