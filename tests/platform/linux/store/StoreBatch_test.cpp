// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreBatch.h"

#include <gmock/gmock.h>
#include <rapidcheck/gtest.h>
#include <string>
#include <variant>
#include <vector>

#include "support/PackedMaps.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;

using AnyRow = std::variant<AnalyticsRow, MetricRow, PowerRow, RtcSessionRow, RtcMessageRow>;

template <typename Row>
void add(StoreBatch& batch, const Row& row) {
  batch.add(row, StoreRowText(row));
}

// What a batch is expected to hold: a description of each row, for each table.
struct Expected {
  std::vector<std::string> analytics;
  std::vector<std::string> metrics;
  std::vector<std::string> power;
  std::vector<std::string> messages;
  std::size_t rows = 0;

  void add(const AnalyticsRow& row) {
    analytics.push_back(textOf(row.recordedAt) + "|" + row.names.first.string() + "|" +
                        row.names.second.string() + "|" + row.payload.text());
  }
  void add(const MetricRow& row) {
    metrics.push_back(textOf(row.postedAt) + "|" + std::to_string(row.identifier) + "|" + row.record);
  }
  void add(const PowerRow& row) {
    power.push_back(textOf(row.recordedAt) + "|" + std::to_string(row.group) + "|" + row.name.string() + "|" +
                    row.payload.text());
  }
  void add(const RtcSessionRow&) {}
  void add(const RtcMessageRow& row) {
    messages.push_back(textOf(row.sentAt) + "|" + textOf(row.session->startedAt) + "|" +
                       std::to_string(row.category) + "|" + std::to_string(row.type) + "|" +
                       row.payload.text());
  }
};

Expected contentsOf(const StoreBatch& batch) {
  Expected found;
  const auto text = [&](StoreBatch::Part part) { return std::string(batch.text(part)); };
  for (const StoreBatch::Analytics& row : batch.analytics()) {
    const EventNames& names = batch.kinds()[row.kind].names;
    found.analytics.push_back(textOf(row.recordedAt) + "|" + names.first.string() + "|" +
                              names.second.string() + "|" + text(row.payload));
  }
  for (const StoreBatch::Metric& row : batch.metrics()) {
    found.metrics.push_back(textOf(row.postedAt) + "|" + std::to_string(row.identifier) + "|" +
                            text(row.record));
  }
  for (const StoreBatch::Power& row : batch.power()) {
    found.power.push_back(textOf(row.recordedAt) + "|" + std::to_string(row.group) + "|" + text(row.name) +
                          "|" + text(row.payload));
  }
  for (const StoreBatch::RtcMessage& row : batch.rtcMessages()) {
    found.messages.push_back(textOf(row.sentAt) + "|" + textOf(batch.sessions()[row.session]->startedAt) +
                             "|" + std::to_string(row.category) + "|" + std::to_string(row.type) + "|" +
                             text(row.payload));
  }
  found.rows = batch.rows();
  return found;
}

void expectEqual(const Expected& found, const Expected& expected) {
  RC_ASSERT(found.analytics == expected.analytics);
  RC_ASSERT(found.metrics == expected.metrics);
  RC_ASSERT(found.power == expected.power);
  RC_ASSERT(found.messages == expected.messages);
  RC_ASSERT(found.rows == expected.rows);
}

// Rows of all tables, with more names and sessions than the batch looks for.
class RandomRows {
 public:
  RandomRows() {
    for (int session = 0; session < 40; ++session) {
      sessions_.push_back(std::make_shared<RtcSessionRecord>());
      sessions_.back()->startedAt = session;
    }
  }

  AnyRow next() {
    const double time = *rc::gen::inRange(0, 1000) / 4.0;
    const ValueMap payload{{"text", *rc::gen::arbitrary<std::string>()}};
    const auto& session = sessions_[*rc::gen::inRange<std::size_t>(0, sessions_.size())];
    const std::string name = "name" + std::to_string(*rc::gen::inRange(0, 600));
    switch (*rc::gen::inRange(0, 6)) {
      case 0:
        return MetricRow{time, *rc::gen::arbitrary<std::uint32_t>(), *rc::gen::arbitrary<std::string>()};
      case 1:
        return PowerRow{time, *rc::gen::inRange<std::int64_t>(-5, 50), name, payload};
      case 2:
        return RtcSessionRow{session};
      case 3:
        return RtcMessageRow{time, session, *rc::gen::arbitrary<std::uint16_t>(),
                             *rc::gen::arbitrary<std::uint16_t>(), payload};
      case 4:
        return AnalyticsRow{time, {name, "second." + name}, payload};
      default:
        return AnalyticsRow{time, name, payload};
    }
  }

 private:
  std::vector<std::shared_ptr<RtcSessionRecord>> sessions_;
};

RC_GTEST_PROP(StoreBatchProperty, HoldsTheSameRowsAsListsDoAlsoWhenItIsUsedAgain, ()) {
  RandomRows random;
  StoreBatch batch;
  for (int use = 0; use < 3; ++use) {
    Expected expected;
    std::size_t bytes = 0;
    const int count = *rc::gen::inRange(0, 150);
    for (int n = 0; n < count; ++n) {
      std::visit(
          [&](const auto& row) {
            expected.add(row);
            ++expected.rows;
            const StoreRowText text(row);
            bytes += StoreBatch::bytesOf(row, text);
            batch.add(row, text);
          },
          random.next());
    }
    expectEqual(contentsOf(batch), expected);
    RC_ASSERT(batch.bytes() == bytes);
    RC_ASSERT(batch.empty() == (count == 0));
    batch.clear();
    expectEqual(contentsOf(batch), {});
    RC_ASSERT(batch.bytes() == 0U);
  }
}

TEST(StoreBatchTest, HoldsTextsOfAllSizes) {
  StoreBatch batch;
  std::vector<std::string> expected;
  for (const std::size_t size :
       std::initializer_list<std::size_t>{0, 1, 16, 1000, 65'535, 65'536, 3'000'000, 2}) {
    add(batch, AnalyticsRow{0.0, "a", {{"text", std::string(size, 'x')}}});
    expected.push_back(R"({"text":")" + std::string(size, 'x') + R"("})");
  }
  std::vector<std::string> found;
  for (const StoreBatch::Analytics& row : batch.analytics()) found.emplace_back(batch.text(row.payload));
  EXPECT_EQ(found, expected);
}

TEST(StoreBatchTest, KeepsTheBufferOfUsualTextsButNotOfALargeOne) {
  StoreBatch batch;
  add(batch, AnalyticsRow{0.0, "a", {{"text", std::string(1000, 'x')}}});
  batch.clear();
  EXPECT_GE(batch.textCapacity(), 1000U);
  add(batch, AnalyticsRow{0.0, "a", {{"text", std::string(StoreBatch::kKeptBytes, 'x')}}});
  EXPECT_GT(batch.textCapacity(), StoreBatch::kKeptBytes);
  batch.clear();
  EXPECT_LT(batch.textCapacity(), 100U);
}

TEST(StoreBatchTest, ARowsTextKeepsTheBufferOfTheThreadUnlessItIsLarge) {
  const auto capacityAfter = [](std::size_t size) {
    { const StoreRowText text(AnalyticsRow{0.0, "a", {{"text", std::string(size, 'x')}}}); }
    return StoreRowText(AnalyticsRow{0.0, "a", {}}).capacity();
  };
  EXPECT_GE(capacityAfter(1000), 1000U);
  EXPECT_LT(capacityAfter(StoreRowText::kKeptBytes), 100U);
}

TEST(StoreBatchTest, CountsARowAtItsTextAndASmallRow) {
  StoreBatch batch;
  add(batch, AnalyticsRow{0.0, "a", {{"text", std::string(1000, 'x')}}});
  EXPECT_EQ(batch.bytes(), sizeof(StoreBatch::Analytics) + 1011U);
}

TEST(StoreBatchTest, KeepsTheNamesOfRowsThatTakeTurnsOnce) {
  // Names whose hashes fall together are kept again with each turn. Each process hashes in its own way, so
  // any pair may be one of those, but not each of four.
  int keptOnce = 0;
  for (const auto& [first, second] : {std::pair("a", "b"), {"d", "e"}, {"f", "g"}, {"h", "i"}}) {
    const EventNames names(first, "c");
    const EventNames others(second, "c");
    StoreBatch batch;
    for (int n = 0; n < 100; ++n) add(batch, AnalyticsRow{0.0, n % 2 == 0 ? names : others, {}});
    if (batch.kinds().size() == 2 && batch.kinds()[0].names == names && batch.kinds()[1].names == others) {
      ++keptOnce;
    }
  }
  EXPECT_GE(keptOnce, 1);
}

TEST(StoreBatchTest, KeepsTheSessionsOfMessagesThatTakeTurnsOnceInTheirOrder) {
  StoreBatch batch;
  const auto first = std::make_shared<RtcSessionRecord>();
  const auto second = std::make_shared<RtcSessionRecord>();
  add(batch, RtcSessionRow{second});
  for (int n = 0; n < 10; ++n) {
    add(batch, RtcMessageRow{0.0, first, 1, 1, {}});
    add(batch, RtcMessageRow{0.0, second, 1, 1, {}});
  }
  EXPECT_THAT(batch.sessions(), ElementsAre(second, first));
  EXPECT_EQ(batch.rows(), 21U);
}

class SharingBatchTest : public testing::Test {
 protected:
  RtcMessageRow messageOf(const ValueMap& payload, double time = 5.0) const {
    return {time, session_, 4, 3, payload, "hidden"};
  }
  void addEvent(const ValueMap& payload, double time = 5.0) { add(batch_, AnalyticsRow{time, "a", payload}); }

  const std::shared_ptr<RtcSessionRecord> session_ = std::make_shared<RtcSessionRecord>();
  const ValueMap payload_{{"n", 1}, {"hidden", 2}};
  StoreBatch batch_;
};

TEST_F(SharingBatchTest, AMessageSharesTheRowOfTheEventBeforeIt) {
  addEvent(payload_);
  const std::size_t bytes = batch_.bytes();
  add(batch_, MetricRow{5.0, 1, "between"});
  const std::size_t metricBytes = batch_.bytes() - bytes;
  EXPECT_TRUE(batch_.share(messageOf(payload_, 5.0005)));
  ASSERT_TRUE(batch_.analytics().front().rtc);
  const StoreBatch::Shared& shared = *batch_.analytics().front().rtc;
  EXPECT_EQ(batch_.sessions()[shared.session], session_);
  EXPECT_EQ(shared.category, 4);
  EXPECT_EQ(shared.type, 3);
  EXPECT_EQ(shared.hidden.begin, std::string_view(R"({"n":1)").size());
  EXPECT_EQ(shared.hidden.size, std::string_view(R"(,"hidden":2)").size());
  EXPECT_EQ(batch_.rows(), 2U);
  EXPECT_EQ(batch_.bytes(), bytes + metricBytes);
}

TEST_F(SharingBatchTest, ARowIsSharedOnlyWithAMessageOfItsUser) {
  const AnalyticsRow event{5.0, "a", payload_};
  batch_.add(event, StoreRowText(event), {.user = 1001});
  EXPECT_FALSE(batch_.share(messageOf(payload_)));
  EXPECT_FALSE(batch_.share(messageOf(payload_), 1002));
  EXPECT_TRUE(batch_.share(messageOf(payload_), 1001));
}

TEST_F(SharingBatchTest, ARowIsSharedOnce) {
  addEvent(payload_);
  EXPECT_TRUE(batch_.share(messageOf(payload_)));
  EXPECT_FALSE(batch_.share(messageOf(payload_)));
}

TEST_F(SharingBatchTest, ARowIsNotSharedWithAnotherPayload) {
  EXPECT_FALSE(batch_.share(messageOf(payload_)));
  addEvent(payload_);
  EXPECT_FALSE(batch_.share(messageOf({{"n", 1}, {"hidden", 2}})));  // equal, but another message's
  addEvent({{"n", 1}});
  EXPECT_FALSE(batch_.share(messageOf(payload_)));  // that of the event before
  addEvent({});
  EXPECT_FALSE(batch_.share(messageOf({})));  // every empty payload is the same
  EXPECT_FALSE(batch_.analytics()[0].rtc || batch_.analytics()[1].rtc || batch_.analytics()[2].rtc);
}

TEST_F(SharingBatchTest, ARowIsNotSharedWhenAnotherMessageCameBetween) {
  addEvent(payload_);
  add(batch_, messageOf({{"other", 1}}));
  EXPECT_FALSE(batch_.share(messageOf(payload_)));
}

TEST_F(SharingBatchTest, ARowIsNotSharedAtAnotherTime) {
  for (const double time : {4.9999, 5.0011}) {
    addEvent(payload_);
    EXPECT_FALSE(batch_.share(messageOf(payload_, time)));
  }
}

// A change of the payload would take its storage, if the batch did not hold it.
TEST_F(SharingBatchTest, ARowIsNotSharedWithAPayloadThatHasChangedSince) {
  ValueMap payload{{"n", 1}};
  addEvent(payload);
  payload.set("n", 2);
  EXPECT_FALSE(batch_.share(messageOf(payload)));
}

TEST_F(SharingBatchTest, ARowIsNotSharedWhenTheHiddenEntryIsNotFoundInItsText) {
  const ValueMap payload{{"n", 1}, {"hidden", "a text"}};
  addEvent(payload);
  EXPECT_FALSE(batch_.share(messageOf(payload)));
  EXPECT_TRUE(batch_.share({5.0, session_, 4, 3, payload}));  // without a hidden entry
}

TEST_F(SharingBatchTest, AnEventWithALongTextIsNeitherSharedNorHeld) {
  for (const std::size_t size : {StoreBatch::kMaxSharedTextBytes, StoreBatch::kMaxSharedTextBytes + 1}) {
    ShapeTable shapes;
    const std::size_t others = std::string_view(R"({"hidden":2,"t":""})").size();
    const ValueMap payload = packedMapOf({{"hidden", 2}, {"t", std::string(size - others, 'x')}}, shapes);
    addEvent(payload);
    const bool isShort = size == StoreBatch::kMaxSharedTextBytes;
    EXPECT_EQ(batch_.analytics().back().payload.size, size);
    EXPECT_EQ(payload.packed()->isShared(), isShort);
    EXPECT_EQ(batch_.share(messageOf(payload)), isShort);
  }
}

TEST_F(SharingBatchTest, ABatchWhoseSharingEndedSharesOnlyLaterRows) {
  addEvent(payload_);
  batch_.endSharing();
  EXPECT_FALSE(batch_.share(messageOf(payload_)));
  addEvent(payload_);
  EXPECT_TRUE(batch_.share(messageOf(payload_)));
}

TEST_F(SharingBatchTest, AClearedBatchSharesNothing) {
  addEvent(payload_);
  batch_.clear();
  EXPECT_FALSE(batch_.share(messageOf(payload_)));
}

TEST(StoreBatchTest, ReleasesSessionsWhenItIsCleared) {
  StoreBatch batch;
  const auto session = std::make_shared<RtcSessionRecord>();
  add(batch, RtcMessageRow{0.0, session, 1, 1, {}});
  EXPECT_EQ(session.use_count(), 2);
  batch.clear();
  EXPECT_EQ(session.use_count(), 1);
}

}  // namespace
}  // namespace tonewerk
