// SPDX-License-Identifier: Apache-2.0
#include <cstdint>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/journal/SegmentJournal.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryJournal.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// What a record had, when its bytes are not valid any more.
struct Seen {
  std::uint64_t sequence = 0;
  Journal::Kind kind = Journal::Kind::kRequest;
  double at = 0.0;
  std::uint64_t client = 0;
  std::uint32_t user = 0;
  std::string bytes;

  friend bool operator==(const Seen&, const Seen&) = default;
};

class OnDisk {
 public:
  Journal& journal() { return *journal_; }
  void restart() {
    journal_.reset();
    journal_ = std::make_unique<SegmentJournal>(directory_.path("journal"), preferences_, category_);
  }

 private:
  TemporaryDirectory directory_;
  MemoryPreferenceStore preferences_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  std::unique_ptr<Journal> journal_ =
      std::make_unique<SegmentJournal>(directory_.path("journal"), preferences_, category_);
};

class InMemory {
 public:
  Journal& journal() { return *journal_; }
  void restart() { journal_ = std::make_unique<MemoryJournal>(disk_); }

 private:
  std::shared_ptr<MemoryJournalDisk> disk_ = std::make_shared<MemoryJournalDisk>();
  std::unique_ptr<Journal> journal_ = std::make_unique<MemoryJournal>(disk_);
};

// The contract of all journals.
template <typename Place>
class JournalContract : public testing::Test {
 protected:
  static constexpr Journal::Origin kOrigin{1'763'633'880.25, 7, 1001};

  Journal& journal() { return place_.journal(); }
  std::uint64_t append(std::string_view bytes) {
    return journal().append(Journal::Kind::kRequest, kOrigin, bytes);
  }
  void write() { EXPECT_TRUE(journal().write()); }
  std::vector<Seen> read() {
    std::vector<Seen> seen;
    reading_ = journal().read([&](const Journal::Record& record) {
      seen.push_back({record.sequence, record.kind, record.origin.at, record.origin.client,
                      record.origin.user, std::string(record.bytes)});
      return true;
    });
    EXPECT_EQ(reading_.records, seen.size());
    return seen;
  }
  std::vector<std::uint64_t> readNumbers() {
    std::vector<std::uint64_t> numbers;
    for (const Seen& seen : read()) numbers.push_back(seen.sequence);
    return numbers;
  }
  // Numbers and bytes of `count` records, which fill several segments.
  void writeLong(std::size_t count) {
    for (std::size_t at = 0; at < count; ++at) {
      append(std::string(kMaxFrameBytes, static_cast<char>('a' + at)));
      write();
    }
  }

  Place place_;
  Journal::Reading reading_;
};

using Places = testing::Types<OnDisk, InMemory>;
TYPED_TEST_SUITE(JournalContract, Places);

TYPED_TEST(JournalContract, ANewJournalHasNothing) {
  EXPECT_EQ(this->journal().last(), 0U);
  EXPECT_EQ(this->journal().bytes(), 0U);
  EXPECT_THAT(this->read(), IsEmpty());
  EXPECT_TRUE(this->journal().write());
  EXPECT_TRUE(this->journal().sync());
}

TYPED_TEST(JournalContract, RecordsAreNumberedFromOne) {
  EXPECT_EQ(this->append("a"), 1U);
  EXPECT_EQ(this->append("b"), 2U);
  EXPECT_EQ(this->journal().last(), 2U);
}

TYPED_TEST(JournalContract, WhatWasWrittenIsReadByTheNextProcessInOrder) {
  const std::string binary("\0\xC1\xFF a", 5);
  this->journal().append(Journal::Kind::kConnected, {1.5, 1, 1000}, "process");
  this->journal().append(Journal::Kind::kRequest, {2.5, ~std::uint64_t{0}, ~std::uint32_t{0}}, binary);
  this->write();
  this->journal().append(Journal::Kind::kDisconnected, {-3.5, 1, 0}, "");
  this->write();
  this->place_.restart();
  EXPECT_THAT(this->read(),
              ElementsAre(Seen{1, Journal::Kind::kConnected, 1.5, 1, 1000, "process"},
                          Seen{2, Journal::Kind::kRequest, 2.5, ~std::uint64_t{0}, ~std::uint32_t{0}, binary},
                          Seen{3, Journal::Kind::kDisconnected, -3.5, 1, 0, ""}));
  EXPECT_EQ(this->reading_.damagedPlaces, 0U);
  EXPECT_EQ(this->reading_.damagedBytes, 0U);
  EXPECT_EQ(this->reading_.tornBytes, 0U);
}

TYPED_TEST(JournalContract, WhatWasNotWrittenEndsWithTheProcess) {
  this->append("written");
  this->write();
  this->append("not written");
  this->place_.restart();
  EXPECT_THAT(this->readNumbers(), ElementsAre(1));
}

TYPED_TEST(JournalContract, ARequestWithoutAFrameBecomesOne) {
  EXPECT_EQ(this->journal().append(this->kOrigin, "sendMessage", {Value(1), std::nullopt, Value("text")}),
            1U);
  this->write();
  this->place_.restart();
  const std::vector<Seen> seen = this->read();
  ASSERT_EQ(seen.size(), 1U);
  EXPECT_EQ(seen.front().kind, Journal::Kind::kRequest);
  EXPECT_EQ(seen.front().client, 7U);
  EXPECT_THAT(seen.front().bytes, testing::AllOf(HasSubstr("sendMessage"), HasSubstr("text")));
}

TYPED_TEST(JournalContract, ReadingEndsWhenTheVisitorWantsNoMore) {
  for (const char* bytes : {"a", "b", "c"}) this->append(bytes);
  this->write();
  this->place_.restart();
  std::size_t visits = 0;
  const Journal::Reading reading =
      this->journal().read([&visits](const Journal::Record&) { return ++visits < 2; });
  EXPECT_EQ(visits, 2U);
  EXPECT_EQ(reading.records, 2U);
  EXPECT_EQ(reading.tornBytes, 0U);
}

TYPED_TEST(JournalContract, NumbersGoOnInTheNextProcess) {
  this->append("a");
  this->append("b");
  this->write();
  for (std::uint64_t next = 3; next < 6; ++next) {
    this->place_.restart();
    EXPECT_EQ(this->journal().last(), next - 1);
    EXPECT_EQ(this->append("c"), next);
    this->write();
  }
  this->place_.restart();
  EXPECT_THAT(this->readNumbers(), ElementsAre(1, 2, 3, 4, 5));
}

TYPED_TEST(JournalContract, NumbersContinueAfterTheGivenOneAndNeverGoBack) {
  this->append("a");
  this->write();
  this->place_.restart();
  this->journal().continueAfter(40);
  EXPECT_EQ(this->journal().last(), 40U);
  this->journal().continueAfter(5);
  EXPECT_EQ(this->append("b"), 41U);
  this->write();
  this->place_.restart();
  EXPECT_EQ(this->journal().last(), 41U);
  EXPECT_THAT(this->readNumbers(), ElementsAre(1, 41));
}

TYPED_TEST(JournalContract, RecordsThatAreNotDroppedStay) {
  this->writeLong(9);
  this->journal().drop(6);
  this->place_.restart();
  std::vector<std::uint64_t> numbers = this->readNumbers();
  ASSERT_GE(numbers.size(), 4U);
  EXPECT_LT(numbers.size(), 9U) << "nothing was dropped";
  numbers.erase(numbers.begin(), numbers.end() - 4);
  EXPECT_THAT(numbers, ElementsAre(6, 7, 8, 9));
}

TYPED_TEST(JournalContract, DroppedRecordsDoNotCount) {
  const std::uint64_t none = this->journal().bytes();
  this->writeLong(9);
  const std::uint64_t all = this->journal().bytes();
  EXPECT_GE(all, none + 9 * kMaxFrameBytes);
  this->journal().drop(6);
  EXPECT_LT(this->journal().bytes(), all);
  EXPECT_GE(this->journal().bytes(), 4 * kMaxFrameBytes);
  this->journal().drop(10);
  EXPECT_EQ(this->journal().bytes(), 0U);
  this->append("more");
  EXPECT_GT(this->journal().bytes(), 0U);
}

TYPED_TEST(JournalContract, NumbersGoOnWhenEverythingWasDropped) {
  this->writeLong(2);
  this->journal().drop(3);
  this->place_.restart();
  EXPECT_THAT(this->readNumbers(), IsEmpty());
  EXPECT_EQ(this->journal().last(), 2U);
  EXPECT_EQ(this->append("next"), 3U);
  this->write();
  this->place_.restart();
  EXPECT_THAT(this->readNumbers(), ElementsAre(3));
}

TYPED_TEST(JournalContract, DroppingTwiceOrWhatDoesNotExistYetChangesNothing) {
  this->append("a");
  this->write();
  this->journal().drop(0);
  this->journal().drop(1);
  EXPECT_GT(this->journal().bytes(), 0U);
  this->journal().drop(2);
  this->journal().drop(2);
  EXPECT_EQ(this->append("b"), 2U);
  this->write();
  this->place_.restart();
  EXPECT_THAT(this->readNumbers(), testing::Contains(2));
}

TYPED_TEST(JournalContract, ALongJournalIsReadInOrder) {
  this->writeLong(13);
  this->place_.restart();
  const std::vector<Seen> seen = this->read();
  ASSERT_EQ(seen.size(), 13U);
  for (std::size_t at = 0; at < seen.size(); ++at) {
    EXPECT_EQ(seen[at].sequence, at + 1);
    EXPECT_TRUE(seen[at].bytes == std::string(kMaxFrameBytes, static_cast<char>('a' + at))) << at;
  }
}

TYPED_TEST(JournalContract, ManyRecordsOfOneWriteAreReadInOrder) {
  constexpr std::uint64_t kCount = 60'000;  // more than one segment
  for (std::uint64_t at = 1; at <= kCount; ++at) this->append("number " + std::to_string(at));
  this->write();
  this->place_.restart();
  std::uint64_t expected = 0;
  this->journal().read([&](const Journal::Record& record) {
    ++expected;
    EXPECT_EQ(record.sequence, expected);
    EXPECT_EQ(record.bytes, "number " + std::to_string(expected));
    return !testing::Test::HasFailure();
  });
  EXPECT_EQ(expected, kCount);
}

TYPED_TEST(JournalContract, WhatIsSyncedAndWrittenAgainIsReadOnce) {
  this->append("a");
  this->write();
  EXPECT_TRUE(this->journal().sync());
  this->write();
  EXPECT_TRUE(this->journal().sync());
  this->place_.restart();
  EXPECT_THAT(this->readNumbers(), ElementsAre(1));
}

TYPED_TEST(JournalContract, WhatIsClearedIsNotReadAgainAndItsNumbersAreNotUsedAgain) {
  this->append("a");
  this->append("b");
  this->write();
  this->append("not written");
  this->journal().clear();
  EXPECT_EQ(this->journal().bytes(), 0U);
  this->append("c");
  this->write();
  this->place_.restart();
  EXPECT_THAT(this->readNumbers(), ElementsAre(4));
}

TYPED_TEST(JournalContract, AClearedJournalIsEmptyForTheNextProcess) {
  this->append("a");
  this->write();
  this->journal().clear();
  this->place_.restart();
  EXPECT_EQ(this->journal().bytes(), 0U);
  EXPECT_THAT(this->readNumbers(), IsEmpty());
}

TYPED_TEST(JournalContract, FirstWithinSaysWhatToDropToMakeRoom) {
  for (int record = 0; record < 20; ++record) {
    this->append(std::string(1'000'000, 'x'));
    this->write();
  }
  Journal& journal = this->journal();
  EXPECT_EQ(journal.firstWithin(journal.bytes()), 1U);
  EXPECT_EQ(journal.firstWithin(0), journal.last() + 1);
  constexpr std::uint64_t kRoom = 9'000'000;
  const std::uint64_t first = journal.firstWithin(kRoom);
  EXPECT_GT(first, 1U);
  EXPECT_LE(first, journal.last());
  journal.drop(first);
  EXPECT_LE(journal.bytes(), kRoom);
  EXPECT_GT(journal.bytes(), 0U);
}

}  // namespace
}  // namespace tonewerk
