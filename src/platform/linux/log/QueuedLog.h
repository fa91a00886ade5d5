// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <thread>

#include "platform/SinkStatus.h"
#include "platform/linux/log/LogOutput.h"

namespace tonewerk {

class Clock;

// Writes lines on a thread of its own, so that nobody waits for a disk, a pipe or a journal that takes none.
//
//   write() -> bounded queue -> the log's thread -> output
//           -> no room: dropped and counted
//
// Lines keep their order and the time at which they were logged. How many lines were dropped is said where
// they are missing: "log lines dropped, because writing the log hangs: 4711".
//
// A process that ends waits for its lines: the destructor and flush() do, each for a limited time, and so
// does a fatal signal (writeLinesBeforeFatalSignals()). A process that is killed loses what is queued, which
// is usually nothing.
class QueuedLog final : public Log {
 public:
  struct Limits {
    std::size_t bytes = std::size_t{4} << 20;  // of waiting lines; a single line always fits
    std::chrono::milliseconds end{2000};       // how long the destructor waits
  };

  // `clock` outlives the log.
  QueuedLog(std::unique_ptr<LogOutput> output, const Clock& clock)
      : QueuedLog(std::move(output), clock, {}) {}
  QueuedLog(std::unique_ptr<LogOutput> output, const Clock& clock, const Limits& limits);
  QueuedLog(const QueuedLog&) = delete;
  QueuedLog& operator=(const QueuedLog&) = delete;
  // A thread that hangs in the output is left behind, with the output.
  ~QueuedLog() override;

  bool isEnabled(std::string_view category, LogLevel level) const override;
  std::optional<LogLevel> fixedThreshold(std::string_view category) const override;
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

  // Any thread. Returns when all lines that were logged before are written. False after `timeout`.
  [[nodiscard]] bool flush(std::chrono::milliseconds timeout);

  // Any thread. Counts lines.
  SinkStatus status() const;

  // From now on a signal that ends the process because of an error in it waits for this log's lines first,
  // for a tenth of a second at most. One log of the process; a signal that has a handler already keeps it.
  void writeLinesBeforeFatalSignals();

 private:
  struct Shared;

  const Clock& clock_;
  const Limits limits_;
  const std::shared_ptr<Shared> shared_;  // with the thread, which may outlive the log
  std::thread thread_;
};

}  // namespace tonewerk
