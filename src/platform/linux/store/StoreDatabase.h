// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <sys/types.h>

#include "platform/linux/store/AnalyticsTable.h"
#include "platform/linux/store/LedgerTable.h"
#include "platform/linux/store/LifeTable.h"
#include "platform/linux/store/MetricTable.h"
#include "platform/linux/store/PowerTable.h"
#include "platform/linux/store/RtcTable.h"
#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreAge.h"
#include "platform/linux/store/StoreBatch.h"
#include "platform/linux/store/StoreFile.h"
#include "platform/linux/store/StoreHoldings.h"
#include "platform/linux/store/StoreMarks.h"
#include "platform/linux/store/StoreNumbering.h"
#include "platform/linux/store/StoreTrimmer.h"

namespace tonewerk {

class Clock;

// The report store's file. Used on the writer's thread.
//
// It is opened by the first write, and again after every failure. So the next try uses a disk that works
// again, a directory that was made, or a file that was put in place by hand. What each user holds stays known
// as long as it is the same file, because reading all rows for each try that fails would take very long.
class StoreDatabase {
 public:
  enum class Result {
    kDone,
    kFailed,   // nothing is written; another try may succeed
    kCorrupt,  // the file is damaged or is no database
  };

  // Copying a large file again and again would wear the disk out.
  static constexpr std::chrono::minutes kSalvageInterval{5};

  // The file is in `directory`, which is made when it is missing. `json` and `clock` outlive it.
  StoreDatabase(std::string directory, const JsonService& json, const Clock& clock);

  // Writes all rows or none of them. The operating system then has the rows; a power cut may lose the last
  // ones.
  [[nodiscard]] Result write(const StoreBatch& batch);
  // The bounds of the next trims and of the write-ahead log.
  void setBounds(const StoreBounds& bounds);
  // Deletes rows that are too old and sendings that are too many, or enough rows to keep the file's size, in
  // one slice of work. Sets `moreToDo` when another slice is needed. Does nothing while the file is closed.
  [[nodiscard]] Result trimAge(bool& moreToDo);
  [[nodiscard]] Result trimSize(bool& moreToDo);
  // What the rows of a user count (StoreHolding). 0 before the first trimSize(), which reads the rows that
  // were there.
  std::int64_t bytesOf(std::uint32_t user) const { return holdings_.of(user); }
  // By how many seconds the wall clock has jumped since the last call; mostly 0.
  double takeJump() { return age_.takeJump(); }
  // After kCorrupt: begins a new file with the rows that can be read, and renames the damaged one and its
  // side files to "<path>.corrupt...", replacing those of an earlier time. On failure it is false, problem()
  // describes it, and the damaged file stays in place. When there was no room for the rows, they are copied
  // again by the first call after kSalvageInterval.
  [[nodiscard]] bool beginAnew();
  // How many rows the last beginAnew() has saved.
  std::int64_t salvagedRows() const { return salvagedRows_; }

  // Any thread.
  const std::string& path() const { return path_; }
  // Any thread. The schema version of a newer file in whose place path() is used, if there is one.
  std::optional<std::int64_t> newerSchema() const { return file_.newerSchema; }
  // Describes the last failure.
  const std::string& problem() const { return problem_; }

 private:
  struct FileIdentity {
    dev_t device = 0;
    ino_t inode = 0;

    friend bool operator==(const FileIdentity&, const FileIdentity&) = default;
  };

  // None when there is no such file.
  static std::optional<FileIdentity> identityOf(const std::string& path);
  [[nodiscard]] Result open();
  [[nodiscard]] bool prepareFile();
  [[nodiscard]] bool saveRows(const std::string& damage);
  void removeSalvaging();
  // From here on what was saved takes the place of the damaged file, now or at the next start.
  [[nodiscard]] bool endSalvage();
  // If there is something that was saved: moves the damaged file aside and puts it in place.
  [[nodiscard]] bool takeSalvaged();
  // A file of an earlier version becomes one of this version.
  [[nodiscard]] bool migrate(std::int64_t version);
  // So does one of this version that was made before it had the table of sendings.
  [[nodiscard]] bool ensureSendings();
  [[nodiscard]] bool insert(const StoreBatch& batch);
  void applyBounds();
  [[nodiscard]] Result resultOf(StoreTrimmer::Outcome outcome, bool& moreToDo);
  [[nodiscard]] Result fail();
  [[nodiscard]] Result failWith(std::string problem);
  void closeWith(std::string problem);
  void close();

  const std::string directory_;
  const StoreFile file_;
  const std::string path_;
  const JsonService& json_;
  const Clock& clock_;
  SqliteDatabase database_;
  StoreHoldings holdings_{database_};
  StoreAge age_;
  // Have a value while the file is open.
  SqliteStatement begin_;
  SqliteStatement commit_;
  std::optional<StoreNumbering> numbering_;
  std::optional<AnalyticsTable> analytics_;
  std::optional<MetricTable> metrics_;
  std::optional<PowerTable> power_;
  std::optional<RtcTable> rtc_;
  std::optional<LifeTable> lives_;
  std::optional<LedgerTable> ledger_;
  std::optional<StoreMarkTable> marks_;
  std::optional<StoreTrimmer> trimmer_;
  // Numbers the files that this process began or found; this is the open one's number. Sessions
  // have their identifiers in the file of one number only.
  std::uint64_t fileNumber_ = 0;
  // The file that was opened last, if it may still be the one of this number.
  std::optional<FileIdentity> opened_;
  // The file that has, or will have, the place of a damaged one that this process wrote. The lives that it
  // has are this process's, and have the identifiers that they had in the files from this number on.
  std::optional<FileIdentity> saved_;
  std::uint64_t firstSavedNumber_ = 0;
  StoreBounds bounds_;
  std::int64_t salvagedRows_ = 0;
  std::optional<std::chrono::nanoseconds> nextSalvage_;  // after one that had no room
  std::string salvageProblem_;
  std::string problem_;
};

}  // namespace tonewerk
