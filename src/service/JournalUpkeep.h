// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

#include "platform/SerialQueue.h"
#include "platform/TimerService.h"

namespace tonewerk {

class Journal;
class TWReportingContext;

// Brings the journal to the disk now and then, drops what is not needed any more, and keeps it within its
// bound. Not needed are the records before the oldest open session, once everything that came of them is on
// the disk.
//
//   a record is added -> ticks begin ... nothing new, and nothing more to drop -> ticks end
//   tick: sync -> look what is needed, and what has been reported
//         -> a later tick: it is written -> it is brought to the disk -> drop
//   the journal is above its bound -> the oldest open sessions are not covered any more -> drop at once
class JournalUpkeep {
 public:
  // What has become of reports.
  struct Reports {
    // How many rows the store was given, and whether so many are written. Any thread.
    std::function<std::uint64_t()> recorded;
    std::function<bool(std::uint64_t)> areWritten;
    // Brings what is written to the disk. May take long; called on a thread for that. False on failure.
    std::function<bool()> sync;
  };
  struct Bounds {
    std::chrono::seconds interval{5};
    // Above this size the oldest open sessions are not covered any more.
    std::uint64_t bytes = std::uint64_t{64} << 20;
  };

  // On the work queue, or before anything runs there. The references outlive the object. `bounds` is asked
  // for at each tick.
  JournalUpkeep(Journal& journal, TWReportingContext& context, Reports reports,
                std::function<Bounds()> bounds);
  JournalUpkeep(const JournalUpkeep&) = delete;
  JournalUpkeep& operator=(const JournalUpkeep&) = delete;
  // Not on the work queue.
  ~JournalUpkeep();

  // Drops what is not needed, on the work queue. All reports must be written.
  void dropNow();

 private:
  // What may be dropped when everything reported so far is written.
  struct Ticket {
    std::uint64_t neededFrom = 0;
    std::uint64_t rows = 0;
    std::shared_ptr<const std::atomic<bool>> areFilesWritten;
    bool isSyncing = false;  // it is written, and now brought to the disk
  };

  void tick();
  // From here on, on the work queue.
  void recordAdded();
  void beginTicks();
  void look();
  bool isWritten(const Ticket& ticket) const;
  void makeTicket();
  void bringToDisk();
  void drop(bool isOnDisk);
  void watchSize();
  void makeRoom();
  std::uint64_t neededFrom() const;

  Journal& journal_;
  TWReportingContext& context_;
  const Reports reports_;
  const std::function<Bounds()> readBounds_;
  Bounds bounds_;
  std::optional<Ticket> ticket_;
  std::uint64_t lookedAt_ = 0;  // the newest record at the last ticket
  bool hasUncovered_ = false;   // since the journal was within half of its bound
  std::atomic<bool> isEnding_ = false;
  std::unique_ptr<SerialQueue> syncing_;  // where it may take long
  std::unique_ptr<Timer> timer_;          // while there is something to do
};

}  // namespace tonewerk
