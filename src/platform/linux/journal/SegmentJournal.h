// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/Journal.h"
#include "platform/linux/journal/JournalDirectory.h"
#include "platform/linux/journal/OldSegments.h"
#include "platform/linux/journal/PendingRecords.h"
#include "platform/linux/journal/SegmentFormat.h"
#include "values/FunctionRef.h"
#include "values/Mutex.h"

namespace tonewerk {

class LogCategory;
class PreferenceStore;

// The journal in files of one directory, its segments. docs/journal.md describes them.
//
//   00000000000000000001.segment    the records 1 to 20411
//   00000000000000020412.segment    the newest; its name is the number of its first record
//
// Each process begins a segment with its first record. A failed write leaves whole records in its segment:
// what was written of the record that was cut off is removed, or a new segment is begun.
//
// drop() removes a segment when all its records are dropped, or renames it to .old (OldSegments). The newest
// one stays, so that numbers go on after it in the next process. It is replaced by an empty one when it is
// large.
//
// Only one process at a time may use a directory. When the directory cannot be used, nothing is read, records
// are kept up to Limits::pendingBytes, and each write() tries again.
class SegmentJournal final : public Journal {
 public:
  struct Limits {
    // The most bytes of a segment. A record that is longer has a segment for itself.
    std::size_t segmentBytes = kMaxSegmentBytes;
    // The most bytes of records that wait for a write that succeeds. Then the oldest are given up. What is
    // given up is counted, and logged when writing goes on.
    std::size_t pendingBytes = std::size_t{4} << 20;
    // At the start, what cannot be opened or read is tried so often, after a pause each time: nobody may have
    // a descriptor left for a moment. What is not read then is not recovered.
    int tries = 10;
    std::chrono::milliseconds pause{20};
  };

  // Opens the directory, and reads the newest segment to know the last number. May take Limits::pause several
  // times. All references outlive the
  // journal.
  SegmentJournal(const std::string& directory, const PreferenceStore& preferences, const LogCategory& log)
      : SegmentJournal(std::make_unique<LinuxJournalDirectory>(directory), preferences, log, Limits()) {}
  SegmentJournal(std::unique_ptr<JournalDirectory> directory, const PreferenceStore& preferences,
                 const LogCategory& log, const Limits& limits);
  SegmentJournal(const SegmentJournal&) = delete;
  SegmentJournal& operator=(const SegmentJournal&) = delete;
  // Does not write what waits.
  ~SegmentJournal() override;

  std::uint64_t append(Kind kind, const Origin& origin, std::string_view bytes) override;
  std::uint64_t append(const Origin& origin, std::string_view method, const Arguments& arguments) override;
  [[nodiscard]] bool write() override;
  [[nodiscard]] bool sync() override;
  Reading read(FunctionRef<bool(const Record&)> visit) override;
  void drop(std::uint64_t before) override;
  void clear() override;
  std::uint64_t firstWithin(std::uint64_t bytes) const override;
  std::uint64_t last() const override { return last_; }
  void continueAfter(std::uint64_t sequence) override;
  std::uint64_t bytes() const override { return bytes_.load(std::memory_order_relaxed); }

 private:
  struct Segment {
    std::uint64_t first = 0;
    std::string name;
    std::uint64_t fileBytes = 0;
    std::uint64_t keptBytes = 0;  // of records that are not dropped
    double newestAt = 0.0;        // the time of its newest record
    bool isTorn = false;          // there is more in the file than fileBytes
    std::weak_ptr<JournalFile> file;
  };

  [[nodiscard]] std::error_code tried(FunctionRef<std::error_code()> act) const;
  [[nodiscard]] std::error_code read(const std::string& name, std::size_t maxBytes, std::string& bytes) const;
  [[nodiscard]] std::error_code open();
  [[nodiscard]] std::error_code openLate();
  void addSegment(const JournalDirectory::Entry& entry);
  void leaveAlone(const std::string& name, std::uint64_t bytes, std::string_view why);
  void findLast();
  void removeEmptySegments();

  void makeRoom(std::size_t bytes);
  void giveUp(std::size_t bytes);
  [[nodiscard]] std::error_code writeSome();
  bool hasRoom() const;
  std::size_t fitting() const;
  void noteWritten(Segment& segment, std::size_t bytes);
  void cutOff(Segment& segment);
  [[nodiscard]] std::error_code beginSegment();
  void leaveNewest(std::uint64_t first);
  std::uint64_t nextWritten() const;  // the number of the next record that is written

  void replaceNewest();
  [[nodiscard]] bool retire(const Segment& segment);
  void trimOld();
  void countBytes();
  void logFailure(const std::error_code& error);
  void logSuccess();
  void logSync(const std::error_code& problem) REQUIRES(syncMutex_);

  const std::unique_ptr<JournalDirectory> directory_;
  const LogCategory& log_;
  const Limits limits_;
  const std::uint32_t marker_;
  bool isStarting_ = true;  // nothing was appended yet
  bool isOpen_ = false;
  std::uint64_t last_ = 0;
  double newestAt_ = 0.0;              // the time of the record last_
  std::deque<Segment> segments_;       // the oldest first
  std::shared_ptr<JournalFile> file_;  // of the newest segment, when this process writes to it; else null
  PendingRecords pending_;
  std::string frame_;  // its memory is used again
  OldSegments old_;
  std::uint64_t givenUp_ = 0;  // records, since it was logged
  std::string loggedProblem_;  // empty while writing goes well
  std::string loggedDropProblem_;
  bool isTooLongLogged_ = false;
  std::atomic<std::uint64_t> bytes_ = 0;  // changed by the appending thread only

  Mutex syncMutex_;  // held during a sync, so that a second one waits for what the first one does
  std::string loggedSyncProblem_ GUARDED_BY(syncMutex_);
  Mutex mutex_;  // never held during a call of the system
  std::vector<std::shared_ptr<JournalFile>> unsynced_ GUARDED_BY(mutex_);
  bool isDirectoryUnsynced_ GUARDED_BY(mutex_) = false;
};

}  // namespace tonewerk
