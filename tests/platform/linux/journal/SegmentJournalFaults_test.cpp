// SPDX-License-Identifier: Apache-2.0
//
// A process uses the journal while one or several operations on its files fail: each one in turn, with each
// kind of failure. What was promised is then there for the next process.
#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <gmock/gmock.h>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/journal/FaultyJournalDirectory.h"
#include "platform/linux/journal/SegmentJournal.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryPreferenceStore.h"

namespace tonewerk {
namespace {

constexpr Journal::Origin kOrigin{1'763'633'880.0, 7, 1001};

constexpr SegmentJournal::Limits kLimits{.segmentBytes = 4096, .pendingBytes = 64 << 10, .pause = {}};

// Four of them do not fit into one segment.
std::string longBytes(std::uint64_t sequence) {
  return std::string(kLimits.segmentBytes / 4, static_cast<char>('a' + sequence % 26));
}
std::string shortBytes(std::uint64_t sequence) { return "short " + std::to_string(sequence); }

// What a process has been promised.
struct Promises {
  std::map<std::uint64_t, std::string> appended;
  std::uint64_t written = 0;  // records up to this number
  std::uint64_t synced = 0;
  std::uint64_t dropped = 0;  // records before this number
};

class SegmentJournalFaults : public testing::Test {
 protected:
  SegmentJournalFaults() { makeDirectory(); }

  // The journal does not make it, and so does not sync the one above it, which takes long.
  void makeDirectory() {
    directory_ = std::make_unique<TemporaryDirectory>();
    std::filesystem::create_directory(path());
  }
  std::string path() const { return directory_->path("journal"); }
  std::unique_ptr<SegmentJournal> healthy() {
    return std::make_unique<SegmentJournal>(std::make_unique<LinuxJournalDirectory>(path()), preferences_,
                                            category_, kLimits);
  }

  // Appends, writes, syncs and drops, and goes on after failures as the daemon does.
  Promises runProcess(const std::shared_ptr<JournalFaults>& faults) {
    SegmentJournal journal(std::make_unique<FaultyJournalDirectory>(path(), faults), preferences_, category_,
                           kLimits);
    Promises promises;
    const auto append = [&](bool isLong) {
      const std::uint64_t next = journal.last() + 1;
      std::string bytes = isLong ? longBytes(next) : shortBytes(next);
      EXPECT_EQ(journal.append(Journal::Kind::kRequest, kOrigin, bytes), next);
      promises.appended.emplace(next, std::move(bytes));
    };
    const auto write = [&] {
      if (journal.write()) promises.written = journal.last();
    };
    const auto sync = [&] {
      const std::uint64_t written = promises.written;
      if (journal.sync()) promises.synced = written;
    };
    for (int round = 0; round < 2; ++round) {
      append(false);
      append(false);
      write();
      sync();
      for (int at = 0; at < 3; ++at) append(true);
      write();
      append(false);
      write();
      sync();
      promises.dropped = round == 0 ? 2 : 7;
      journal.drop(promises.dropped);
    }
    // A failure that is over does no more harm.
    for (int attempt = 0; attempt < 5; ++attempt) {
      write();
      sync();
    }
    return promises;
  }

  // What the next process reads must be what was appended, and all that was promised.
  void expectKept(const Promises& promises, std::uint64_t promised, const std::string& what) {
    std::set<std::uint64_t> seen;
    const std::unique_ptr<SegmentJournal> journal = healthy();
    const Journal::Reading reading = journal->read([&](const Journal::Record& record) {
      const auto appended = promises.appended.find(record.sequence);
      EXPECT_TRUE(appended != promises.appended.end() && appended->second == record.bytes) << what;
      EXPECT_TRUE(seen.empty() || *seen.rbegin() < record.sequence) << what;
      seen.insert(record.sequence);
      return true;
    });
    EXPECT_EQ(reading.records, seen.size()) << what;
    for (std::uint64_t sequence = std::max<std::uint64_t>(promises.dropped, 1); sequence <= promised;
         ++sequence) {
      EXPECT_TRUE(seen.contains(sequence)) << what << ", record " << sequence;
    }
    const std::uint64_t last = seen.empty() ? 0 : *seen.rbegin();
    EXPECT_GT(journal->append(Journal::Kind::kRequest, kOrigin, "next"), last) << what;
    EXPECT_TRUE(journal->write()) << what;
  }

  // Runs `check(faults, promises, what)` for each operation that fails, and each kind of failure.
  template <typename Check>
  void forEachFailure(const Check& check) {
    const auto none = std::make_shared<JournalFaults>();
    runProcess(none);
    ASSERT_GT(none->operations, 15U);
    for (std::size_t failing = 1; failing <= none->operations; ++failing) {
      for (const std::size_t count : {std::size_t{1}, std::size_t{3}}) {
        for (const double part : {0.0, 0.001, 0.5, 0.99}) {
          const auto faults = std::make_shared<JournalFaults>();
          faults->failing = failing;
          faults->count = count;
          faults->writtenPart = part;
          faults->error = failing % 2 == 0 ? std::errc::no_space_on_device : std::errc::io_error;
          makeDirectory();
          const Promises promises = runProcess(faults);
          check(*faults, promises,
                "operation " + std::to_string(failing) + " and " + std::to_string(count - 1) +
                    " more fail, written " + std::to_string(part));
          if (HasFailure()) return;
        }
      }
    }
  }

  std::unique_ptr<TemporaryDirectory> directory_;
  MemoryPreferenceStore preferences_;
  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
};

TEST_F(SegmentJournalFaults, WithoutAFailureEverythingIsPromised) {
  const auto none = std::make_shared<JournalFaults>();
  const Promises promises = runProcess(none);
  EXPECT_EQ(promises.appended.size(), 12U);
  EXPECT_EQ(promises.written, 12U);
  EXPECT_EQ(promises.synced, 12U);
  expectKept(promises, promises.synced, "nothing fails");
  EXPECT_THAT(log_.textsAt(LogLevel::kError), testing::IsEmpty());
}

TEST_F(SegmentJournalFaults, WhateverFailsWhatWasWrittenIsReadByTheNextProcess) {
  forEachFailure([this](const JournalFaults&, const Promises& promises, const std::string& what) {
    // A process that ends well has written everything: the failure was over before.
    EXPECT_EQ(promises.written, 12U) << what;
    expectKept(promises, promises.written, what);
  });
}

TEST_F(SegmentJournalFaults, WhateverFailsWhatWasSyncedOutlivesAPowerCut) {
  forEachFailure([this](const JournalFaults& faults, const Promises& promises, const std::string& what) {
    EXPECT_EQ(promises.synced, 12U) << what;
    faults.losePower(path());
    expectKept(promises, promises.synced, what);
  });
}

// The power goes in the middle: after each operation, what was promised until then is there.
TEST_F(SegmentJournalFaults, WhenNothingWorksAnyMoreWhatWasPromisedBeforeIsThere) {
  const auto none = std::make_shared<JournalFaults>();
  runProcess(none);
  for (std::size_t failing = 1; failing <= none->operations; ++failing) {
    const auto faults = std::make_shared<JournalFaults>();
    faults->failing = failing;
    faults->count = none->operations * 2;
    faults->writtenPart = 0.5;
    makeDirectory();
    const Promises promises = runProcess(faults);
    const std::string what = "nothing works from operation " + std::to_string(failing);
    expectKept(promises, promises.written, what);
    if (HasFailure()) return;
    makeDirectory();
    faults->operations = 0;
    faults->disk.clear();
    const Promises again = runProcess(faults);
    faults->losePower(path());
    expectKept(again, again.synced, what + ", and the power fails");
    if (HasFailure()) return;
  }
}

// Nobody may have a descriptor left for a moment. What is not read at the start is not recovered by any later
// process, because the numbers go on.
TEST_F(SegmentJournalFaults, WhatCannotBeOpenedOrReadForAMomentAtTheStartIsReadAllTheSame) {
  constexpr std::size_t kFailures = 6;
  makeDirectory();
  const Promises promises = runProcess(std::make_shared<JournalFaults>());
  const auto read = [this](const std::shared_ptr<JournalFaults>& faults) {
    SegmentJournal journal(std::make_unique<FaultyJournalDirectory>(path(), faults), preferences_, category_,
                           kLimits);
    return journal.read([](const Journal::Record&) { return true; });
  };
  const auto none = std::make_shared<JournalFaults>();
  const std::uint64_t records = read(none).records;
  ASSERT_GE(records, promises.written - promises.dropped);
  for (std::size_t failing = 1; failing <= none->operations; ++failing) {
    SCOPED_TRACE("operation " + std::to_string(failing));
    const auto faults = std::make_shared<JournalFaults>();
    faults->failing = failing;
    faults->count = kFailures;
    const Journal::Reading reading = read(faults);
    EXPECT_EQ(reading.records, records);
    EXPECT_EQ(reading.damagedPlaces, 0U);
  }
  EXPECT_THAT(log_.textsAt(LogLevel::kError), testing::IsEmpty());
}

// A request must not wait for a directory.
TEST_F(SegmentJournalFaults, WhatFailsLaterIsNotTriedAgainAtOnce) {
  makeDirectory();
  const auto faults = std::make_shared<JournalFaults>();
  SegmentJournal journal(std::make_unique<FaultyJournalDirectory>(path(), faults), preferences_, category_,
                         kLimits);
  journal.append(Journal::Kind::kRequest, kOrigin, "request");
  faults->failing = faults->operations + 1;
  faults->count = 1000;
  const std::size_t before = faults->operations;
  EXPECT_FALSE(journal.write());
  EXPECT_EQ(faults->operations, before + 1);
}

}  // namespace
}  // namespace tonewerk
