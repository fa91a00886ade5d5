// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <latch>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <thread>

#include "platform/Heartbeat.h"
#include "platform/accounts/Account.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/store/StoreBatch.h"
#include "platform/linux/store/StoreDatabase.h"
#include "platform/linux/store/StoreQueue.h"

namespace tonewerk {

class Accounts;
class Clock;
class JsonService;
class LogCategory;
class PreferenceStore;

// Keeps the reports on the device: in one SQLite file, written by one thread in batches, at most 100 ms late.
// Any program can read it at any time. docs/store.md describes what is in it.
//
// Recording costs the caller the JSON and a place in a bounded queue. The thread runs the SQL. When the
// queue is full because more is recorded than the disk takes, recording waits. When the file cannot be
// written (a full disk, a missing directory) or the disk hangs, recording does not
// wait: rows are kept while there is room and then dropped. Their number is logged when writing succeeds
// again, and at the end. A damaged file is moved aside, and its rows are saved as far as they can be read.
//
// A row belongs to the user for whom the recording thread works (WorkingFor). The user's account is charged
// for the row's place in the queue (StoreQueue), and for its bytes in the file. When the file is at its
// bound, the user who holds the most loses the oldest rows (StoreTrimmer).
//
// The bounds are the preferences "max_megabytes" (256) and "max_days" (30) of the domain
// "com.orvane.tonewerk.store". They are read again every ten seconds while there is something to write, and
// when readBoundsAgain() asks for it. Rows that are too old are deleted then; their age follows the monotonic
// clock (StoreAge).
class ReportStore {
 public:
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.store";
  static constexpr std::string_view kMaxMegabytesKey = "max_megabytes";
  static constexpr std::string_view kMaxDaysKey = "max_days";

  using Limits = StoreQueue::Limits;

  // The file is in `directory`, which is made when it is missing. All references outlive the store. The
  // monotonic time of `clock` goes on while the device sleeps (WakingClock), or rows would not grow older
  // then. In `accounts` the total of Resource::kSinkBytes becomes that of `limits`, and the total of
  // kStoredBytes the bound of size. The store's thread calls `beforeWriting` before each transaction, unless
  // it is empty: what rows came from must outlive a crash not less than the rows.
  ReportStore(const std::string& directory, const JsonService& json, const PreferenceStore& preferences,
              const Clock& clock, Accounts& accounts, const LogCategory& log, const Limits& limits = {},
              std::function<void()> beforeWriting = {});
  ReportStore(const ReportStore&) = delete;
  ReportStore& operator=(const ReportStore&) = delete;
  // Writes the rows that are left, and gives up when that fails. Logs how many rows are lost.
  ~ReportStore();

  // Any thread. `recordedAt` in seconds since 1970.
  void recordEvent(double recordedAt, EventNames names, ValueMap payload, EventSubject subject = {});
  // Any thread. A row of another table.
  void record(const MetricRow& row);
  void record(const PowerRow& row);
  void record(const RtcSessionRow& row);
  void record(const RtcMessageRow& row);
  // Also while the journal is played: a life that the file has already is known again.
  void record(const LifeRow& row);
  // Any time, too. Unlike the others it never waits: who sends has others who wait.
  void record(const SendingRow& row);

  // Before anything is recorded: the marks in the file. Waits for the store's thread to open the file, and to
  // save the rows of a damaged one. What fails is tried again for a fifth of a second. None on failure, which
  // is logged.
  [[nodiscard]] std::optional<StoreMarks> marks();
  // While the journal is played, rows are left out that are not after `marks`, and until endPlaying() rows of
  // no request, too. Like these, on the thread that plays, while no other thread records.
  void beginPlaying(StoreMarks marks);
  void endPlaying() { isPlaying_ = false; }
  // Nothing is left out any more.
  void endRecovery();

  // Any thread. How many rows have been recorded, and whether the first `rows` of them are in the file.
  std::uint64_t recordedRows() const { return queue_.added(); }
  bool hasWritten(std::uint64_t rows) const { return queue_.hasCommitted(rows); }
  // Any thread. Brings to the disk what is in the file; until then a power cut may take it away. May take
  // long. False on failure, which is logged.
  [[nodiscard]] bool sync();

  // Any thread. The bounds are read again and applied at once, also when there is nothing to write.
  void readBoundsAgain();

  // Any thread, but not from within JsonService, preferences or log, which the store's own thread calls.
  // Returns when everything recorded before is in the file. False when that fails or takes longer than
  // `timeout`.
  [[nodiscard]] bool flush(std::chrono::milliseconds timeout);

  // Any thread. Counts rows.
  SinkStatus status() const { return queue_.status(); }

  // Any thread. The store's thread beats with each try to write, also one that fails, and while SQLite gets
  // on with a long statement. It rests while there is nothing to write. So it stands still when the disk
  // hangs.
  std::shared_ptr<const Heartbeat> heartbeat() const { return heartbeat_; }

 private:
  // Limits how often the preferences are read: not for each batch.
  static constexpr std::chrono::seconds kBoundsInterval{10};
  static constexpr std::chrono::milliseconds kFirstBackOff{500};
  static constexpr std::chrono::milliseconds kLongestBackOff{30'000};

  template <typename Row>
  void add(const Row& row, JournalPosition::Row position = JournalPosition::nextRow());
  template <typename Row>
  void addToQueue(const Row& row, JournalPosition::Row position);
  // Whether a row is in the file, or was of no request when the journal's requests ran first.
  bool isHeld(JournalPosition::Row position) const;
  void run();
  [[nodiscard]] bool takeBatch();
  [[nodiscard]] bool pause(std::chrono::nanoseconds time);
  [[nodiscard]] bool writeUntilDone();
  [[nodiscard]] bool write();
  [[nodiscard]] StoreDatabase::Result writeOrBeginAnew();
  [[nodiscard]] bool beginAnew();
  void trim();
  void chargeStored();
  void readBounds();
  double bound(std::string_view key, double otherwise, std::string& wrong) const;
  // The file at the store's path, as long as the store; none when it cannot be opened. With syncMutex_.
  [[nodiscard]] int openedForSync();
  void logJump();
  void logFailure();
  void logSuccess(std::uint64_t dropped);

  const PreferenceStore& preferences_;
  const Clock& clock_;
  Accounts& accounts_;
  const LogCategory& log_;
  const std::function<void()> beforeWriting_;
  StoreQueue queue_;
  std::atomic<bool> areBoundsStale_ = true;
  std::atomic<bool> isRecovering_ = false;
  std::atomic<bool> isPlaying_ = false;
  StoreMarks heldMarks_;       // written before isRecovering_ is set
  std::latch triedToOpen_{1};  // the thread has tried to open the file
  const std::shared_ptr<Heartbeat> heartbeat_ = std::make_shared<Heartbeat>();

  // Of the file, for sync(), which opens it once. Who closes any descriptor of a file takes this process's
  // locks off it, so that one outlives SQLite's own: without its lock another program that closes the file
  // last would remove the write-ahead log, with all that the store writes there from then on.
  std::mutex syncMutex_;
  FileDescriptor syncFile_;  // guarded by syncMutex_

  // Used by the thread alone.
  StoreDatabase database_;
  StoreBatch batch_;
  std::map<std::uint32_t, Charge> stored_;  // what the rows of each user count
  StoreBounds bounds_;
  std::chrono::nanoseconds boundsReadAt_{0};
  bool ageDue_ = false;  // the oldest rows are to be checked
  bool moreToTrim_ = false;
  std::string loggedProblem_;  // empty while writing goes well
  std::string loggedTrimProblem_;
  std::string loggedWrongBounds_;

  std::thread thread_;
};

}  // namespace tonewerk
