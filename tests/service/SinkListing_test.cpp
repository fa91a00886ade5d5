// SPDX-License-Identifier: Apache-2.0
#include "service/SinkListing.h"

#include <gtest/gtest.h>

#include "platform/SinkStatus.h"

namespace tonewerk {
namespace {

TEST(SinkListingTest, ListsEachSinkAsItStandsNow) {
  SinkList sinks;
  std::uint64_t waiting = 1;
  sinks.add(
      [&waiting] { return SinkStatus{.name = "store", .waiting = waiting, .dropped = 0, .hangs = {}}; });
  sinks.add([] {
    return SinkStatus{.name = "log", .waiting = 7, .dropped = 5, .hangs = std::chrono::seconds(12)};
  });
  waiting = 2;
  const ValueArray expected{ValueMap{{"name", "store"}, {"waiting", 2U}, {"dropped", 0U}, {"hangs", 0}},
                            ValueMap{{"name", "log"}, {"waiting", 7U}, {"dropped", 5U}, {"hangs", 12}}};
  EXPECT_EQ(Value(sinkListing(sinks)).text(), Value(expected).text());
}

}  // namespace
}  // namespace tonewerk
