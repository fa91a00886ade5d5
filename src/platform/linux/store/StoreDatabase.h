// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "platform/linux/store/AnalyticsTable.h"
#include "platform/linux/store/MetricTable.h"
#include "platform/linux/store/PowerTable.h"
#include "platform/linux/store/RtcTable.h"
#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreRow.h"
#include "platform/linux/store/StoreTrimmer.h"

namespace tonewerk {

// The report store's file. The writer's thread.
//
// Opened by the first write and again after every failure, so that a disk that comes back, a directory that
// appears or a file put in place by hand is taken up by the next try.
class StoreDatabase {
 public:
  enum class Result {
    kDone,
    kFailed,   // nothing of it is written; another try may go well
    kCorrupt,  // the file is damaged or no database
  };

  // The file lies in `directory`, which is made when it is missing.
  StoreDatabase(std::string directory, const JsonService& json);

  // All rows, or none of them. The rows are with the operating system afterwards; a power cut may take the
  // last ones.
  [[nodiscard]] Result write(std::span<const StoreRow> rows);
  // What the next trims and the write-ahead log keep to.
  void setBounds(const StoreBounds& bounds);
  // A slice of deleting what is too old at `now`, or of keeping the file's size; `moreToDo` asks for another.
  // Nothing to do while it is closed.
  [[nodiscard]] Result trimAge(double now, bool& moreToDo);
  [[nodiscard]] Result trimSize(bool& moreToDo);
  // Renames the file and what belongs to it to "<path>.corrupt...", over those of an earlier time. False,
  // with a problem(), when it cannot.
  [[nodiscard]] bool moveAside();

  const std::string& path() const { return path_; }
  // What the last failure was.
  const std::string& problem() const { return problem_; }

 private:
  [[nodiscard]] Result open();
  [[nodiscard]] bool prepareFile();
  [[nodiscard]] bool insert(const AnalyticsRow& row);
  [[nodiscard]] bool insert(const MetricRow& row);
  [[nodiscard]] bool insert(const PowerRow& row);
  [[nodiscard]] bool insert(const RtcSessionRow& row);
  [[nodiscard]] bool insert(const RtcMessageRow& row);
  void applyBounds();
  [[nodiscard]] Result resultOf(StoreTrimmer::Outcome outcome, bool& moreToDo);
  [[nodiscard]] Result fail();
  [[nodiscard]] Result failWith(std::string problem);
  void closeWith(std::string problem);
  void close();

  const std::string directory_;
  const std::string path_;
  const JsonService& json_;
  SqliteDatabase database_;
  std::optional<AnalyticsTable> analytics_;  // while it is open
  std::optional<MetricTable> metrics_;       // likewise
  std::optional<PowerTable> power_;          // likewise
  std::optional<RtcTable> rtc_;              // likewise
  std::optional<StoreTrimmer> trimmer_;      // likewise
  std::uint64_t fileNumber_ = 1;             // of the files that this process began or found, the open one's
  StoreBounds bounds_;
  std::string problem_;
};

}  // namespace tonewerk
