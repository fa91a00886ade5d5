// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/RtcSummary.h"

#include <cstdint>
#include <gtest/gtest.h>
#include <limits>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "support/PackedMaps.h"
#include "workers/sinks/TWReportingSessionMetriconWorker.h"
#include "workers/sinks/TWReportingSessionRtcWorker.h"

namespace tonewerk {
namespace {

constexpr AudioServiceType kService = 7;

std::shared_ptr<TWReportingSessionMessage> started(ValueMap payload) {
  auto message = std::make_shared<TWReportingSessionMessage>(std::move(payload), 4, 0);
  message->isSessionStarted = true;
  return message;
}

ValueMap summaryOf(const TWReportingSessionMessages& messages) {
  return rtcSummaryOf(messages, kService, TWReportingSessionRtcWorker::kWorkerClass);
}

TEST(RtcSummaryTest, JoinsTheTextsOfEveryKeyInTheOrderOfTheMessages) {
  ShapeTable shapes;
  const ValueMap summary = summaryOf({started(packedMapOf({{"a", 1}, {"b", "x"}}, shapes)),
                                      started(ValueMap{{"c", 2.5}, {"a", true}}),
                                      started(packedMapOf({{"b", "y"}, {"a", -3}}, shapes))});
  EXPECT_EQ(summary.text(), R"({"TW_Session_Summary_Event":"7","a":"1,1,-3","b":"x,y","c":"2.5"})");
}

TEST(RtcSummaryTest, AnEmptyTextIsAValue) {
  ShapeTable shapes;
  const ValueMap summary = summaryOf({started(packedMapOf({{"a", ""}}, shapes)), started(ValueMap{{"a", ""}}),
                                      started(ValueMap{{"a", "x"}})});
  EXPECT_EQ(summary.text("a"), ",,x");
}

TEST(RtcSummaryTest, LeavesOutRedundantEarlyAndOthersMessages) {
  const auto redundant = started(ValueMap{{"a", 1}});
  redundant->isRedundant = true;
  const auto early = started(ValueMap{{"a", 2}});
  early->isSessionStarted = false;
  const auto others = started(ValueMap{{"a", 3}});
  others->details.setDestinationWorkers({&TWReportingSessionMetriconWorker::kWorkerClass});
  const auto own = started(ValueMap{{"a", 4}});
  own->details.setDestinationWorkers({&TWReportingSessionRtcWorker::kWorkerClass});
  EXPECT_EQ(summaryOf({redundant, early, others, own}).text("a"), "4");
}

TEST(RtcSummaryTest, PackedMessagesAndTreesHaveOneSummary) {
  std::mt19937 random(20261122);
  const std::vector<Value> values{0,
                                  -1,
                                  std::numeric_limits<std::int64_t>::min(),
                                  std::numeric_limits<std::uint64_t>::max(),
                                  300,
                                  0.1,
                                  -2.0,
                                  std::numeric_limits<double>::quiet_NaN(),
                                  -std::numeric_limits<double>::infinity(),
                                  true,
                                  false,
                                  "",
                                  "text, with a comma",
                                  std::string(100, 'x')};
  ShapeTable shapes;
  TWReportingSessionMessages packed;
  TWReportingSessionMessages trees;
  for (int made = 0; made < 5'000; ++made) {
    std::vector<ValueMapEntry> entries;
    ValueMap tree;
    for (const char key : std::string("abcdefgh")) {
      if (random() % 3 == 0) continue;
      entries.push_back({std::string(1, key), values[random() % values.size()]});
    }
    if (entries.empty()) continue;
    if (random() % 2 == 0) std::swap(entries.front(), entries.back());
    for (const ValueMapEntry& entry : entries) tree.set(entry.key, entry.value);
    packed.push_back(started(random() % 10 == 0 ? tree : packedMapOf(entries, shapes)));
    trees.push_back(started(tree));
  }
  EXPECT_EQ(summaryOf(packed).text(), summaryOf(trees).text());
}

}  // namespace
}  // namespace tonewerk
