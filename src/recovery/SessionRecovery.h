// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "platform/linux/store/StoreMarks.h"

namespace tonewerk {

class Accounts;
class BatchedJournal;
class LogCategory;
class RecoveryAttempts;
class ReportStore;
class TWReportingContext;
class TWReportingService;

// Plays what the last daemon's clients asked for when it did not end in order, so that their sessions are
// reported as if it had.
//
//   if (recovery.begin(store.marks())) {
//     queue.async([&] { recovery.play(progress); });
//     ... until the queue has done that ...
//     recovery.end();
//     ... until the reports are written ...
//     if (areWritten) recovery.forget();
//   }
//
// For the daemon's start, before it serves. Each call but play() is for the thread that starts the daemon.
class SessionRecovery {
 public:
  // All outlive the recovery.
  struct Parts {
    BatchedJournal& journal;
    RecoveryAttempts& attempts;
    ReportStore& store;
    Accounts& accounts;
    TWReportingContext& context;
    TWReportingService& service;
    const LogCategory& log;
  };
  // So many requests have been played.
  using Progress = std::function<void(std::uint64_t requests)>;

  explicit SessionRecovery(const Parts& parts) : parts_(parts) {}

  // `marks` say which reports the store has already, for each user. Without them, because the store cannot be
  // read, a session is rather reported twice than never. False when there is nothing to play; then the other
  // calls are not made.
  [[nodiscard]] bool begin(std::optional<StoreMarks> marks);
  // On the work queue, in one piece.
  void play(const Progress& progress);
  // Nothing is played any more. Reports that the store has already are no longer left out.
  void end();
  // Removes what was played, unless a sink has lost a report of it: then the next start plays the same again,
  // and leaves out what is written.
  void forget();

 private:
  const Parts parts_;
};

}  // namespace tonewerk
