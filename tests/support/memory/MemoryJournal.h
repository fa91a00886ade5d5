// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "platform/Journal.h"
#include "values/Mutex.h"

namespace tonewerk {

// What outlives a process that had a MemoryJournal. Give it to the journal of the next one. It shows what has
// become of each record.
//
//   const auto disk = std::make_shared<MemoryJournalDisk>();
//   auto journal = std::make_unique<MemoryJournal>(disk);
//   ...
//   journal = std::make_unique<MemoryJournal>(disk);  // the process was killed and starts again
//   disk->losePower();                                // what was not synced is gone
class MemoryJournalDisk {
 public:
  struct Kept {
    Journal::Kind kind = Journal::Kind::kRequest;
    Journal::Origin origin;
    std::string bytes;
    bool isSynced = false;
  };

  // By their numbers. Between two journals, a test may take some away.
  std::map<std::uint64_t, Kept> records;
  std::uint64_t last = 0;
  // What read() returns, beside the number of records.
  Journal::Reading found;

  void losePower();
};

// A journal whose records live as long as its disk.
//
//   journal.fail(MemoryJournal::Operation::kWrite, 2);  // the second write() from now on fails
//   journal.failAll(MemoryJournal::Operation::kSync);   // every sync() fails, until heal()
//
// A failing append is one whose record is given up: it gets a number and never comes back. A failing read
// ends before its first record. A failing drop drops nothing.
//
// A request without a frame is stored as text, because the double knows no encoding; a test that needs a
// frame gives a function that makes one.
class MemoryJournal final : public Journal {
 public:
  enum class Operation { kAppend, kWrite, kSync, kRead, kDrop };
  using Encode = std::string (*)(std::string_view method, const Arguments& arguments);

  explicit MemoryJournal(std::shared_ptr<MemoryJournalDisk> disk = std::make_shared<MemoryJournalDisk>(),
                         Encode encode = nullptr);

  // The nth use from now on, from 1, fails.
  void fail(Operation operation, std::size_t nth);
  void failAll(Operation operation);
  void heal();
  // How often the operation was used.
  std::size_t uses(Operation operation) const;

  std::uint64_t append(Kind kind, const Origin& origin, std::string_view bytes) override;
  std::uint64_t append(const Origin& origin, std::string_view method, const Arguments& arguments) override;
  [[nodiscard]] bool write() override;
  [[nodiscard]] bool sync() override;
  Reading read(FunctionRef<bool(const Record&)> visit) override;
  void drop(std::uint64_t before) override;
  void clear() override;
  std::uint64_t firstWithin(std::uint64_t bytes) const override;
  std::uint64_t last() const override;
  void continueAfter(std::uint64_t sequence) override;
  std::uint64_t bytes() const override;

 private:
  struct Uses {
    std::size_t count = 0;
    std::size_t failing = 0;  // 0 for none
    bool allFail = false;
  };

  [[nodiscard]] bool isFailing(Operation operation) REQUIRES(mutex_);

  const Encode encode_;
  mutable Mutex mutex_;
  const std::shared_ptr<MemoryJournalDisk> disk_ GUARDED_BY(mutex_);
  std::uint64_t last_ GUARDED_BY(mutex_);
  std::map<std::uint64_t, MemoryJournalDisk::Kept> pending_ GUARDED_BY(mutex_);
  std::map<Operation, Uses> uses_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
