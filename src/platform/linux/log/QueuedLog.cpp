// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/QueuedLog.h"

#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <ctime>
#include <deque>
#include <string>
#include <utility>

#include "platform/Clock.h"
#include "platform/linux/threads/ThreadProperties.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

constexpr std::string_view kSubsystem = "com.orvane.tonewerk";
constexpr std::string_view kCategory = "twrs";
// What a waiting line takes in addition to its texts.
constexpr std::size_t kLineBytes = 160;
// A line that has not been written for this long hangs.
constexpr std::chrono::seconds kHangTime{2};

constexpr std::array kFatalSignals{SIGABRT, SIGBUS, SIGFPE, SIGILL, SIGSEGV};
constexpr int kMaxSignalWaits = 100;

// Lines that are queued or being written, of the log whose lines a fatal signal waits for. A signal handler
// may read nothing but such a number.
std::atomic<std::size_t> linesBeforeFatalSignals = 0;
static_assert(std::atomic<std::size_t>::is_always_lock_free);

// The log's thread goes on meanwhile, unless it is the one that the signal is for.
void waitForLines(int number) {
  const int savedErrno = errno;
  for (int wait = 0; wait < kMaxSignalWaits && linesBeforeFatalSignals != 0; ++wait) {
    const timespec millisecond{0, 1'000'000};
    nanosleep(&millisecond, nullptr);
  }
  errno = savedErrno;
  // The action is the default one again (SA_RESETHAND). The signal ends the process on return.
  std::raise(number);
}

}  // namespace

struct QueuedLog::Shared {
  struct Line {
    double at = 0.0;
    std::string subsystem = {};
    std::string category = {};
    LogLevel level = LogLevel::kDefault;
    std::string message = {};
    std::uint64_t droppedBefore = 0;

    std::size_t bytes() const { return kLineBytes + subsystem.size() + category.size() + message.size(); }
  };

  explicit Shared(std::unique_ptr<LogOutput> its) : output(std::move(its)) {}

  void run() {
    nameThisThread("tw-log");
    MutexLock lock(mutex);
    for (;;) {
      while (lines.empty() && !isEnding) changed.wait(lock);
      if (lines.empty()) break;
      writing.swap(lines);
      writtenAt = std::chrono::steady_clock::now();
      while (!writing.empty()) {
        const Line& line = writing.front();
        lock.unlock();
        writeOne(line);
        lock.lock();
        finish(line);
        writing.pop_front();
      }
      written.notifyAll();
    }
    hasEnded = true;
    written.notifyAll();
  }

  void writeOne(const Line& line) {
    if (line.droppedBefore > 0) {
      output->writeAt(
          line.at, kSubsystem, kCategory, LogLevel::kError,
          "log lines dropped, because writing the log hangs: " + std::to_string(line.droppedBefore));
    }
    // A line without a message only says what was dropped.
    if (!line.category.empty()) {
      output->writeAt(line.at, line.subsystem, line.category, line.level, line.message);
    }
  }

  void finish(const Line& line) REQUIRES(mutex) {
    waitingBytes -= line.bytes();
    ++writtenLines;
    writtenAt = std::chrono::steady_clock::now();
    if (isForFatalSignals) --linesBeforeFatalSignals;
  }

  void queue(Line line) REQUIRES(mutex) {
    line.droppedBefore = std::exchange(unsaid, 0);
    waitingBytes += line.bytes();
    if (addedLines++ == writtenLines) writtenAt = std::chrono::steady_clock::now();
    if (isForFatalSignals) ++linesBeforeFatalSignals;
    lines.push_back(std::move(line));
    if (lines.size() == 1) changed.notifyOne();
  }

  const std::unique_ptr<LogOutput> output;
  mutable Mutex mutex;
  Condition changed;  // the thread waits for lines
  Condition written;  // flush() waits for the thread
  std::deque<Line> lines GUARDED_BY(mutex);
  // Only the thread takes lines out, and does so with the lock.
  std::deque<Line> writing;
  std::size_t waitingBytes GUARDED_BY(mutex) = 0;  // of both
  std::uint64_t addedLines GUARDED_BY(mutex) = 0;
  std::uint64_t writtenLines GUARDED_BY(mutex) = 0;
  std::uint64_t dropped GUARDED_BY(mutex) = 0;
  std::uint64_t unsaid GUARDED_BY(mutex) = 0;  // dropped since the last line
  std::chrono::steady_clock::time_point writtenAt GUARDED_BY(mutex);
  bool isForFatalSignals GUARDED_BY(mutex) = false;
  bool isEnding GUARDED_BY(mutex) = false;
  bool hasEnded GUARDED_BY(mutex) = false;
};

QueuedLog::QueuedLog(std::unique_ptr<LogOutput> output, const Clock& clock, const Limits& limits)
    : clock_(clock),
      limits_(limits),
      shared_(std::make_shared<Shared>(std::move(output))),
      thread_([shared = shared_] { shared->run(); }) {}

QueuedLog::~QueuedLog() {
  const auto deadline = std::chrono::steady_clock::now() + limits_.end;
  bool hasEnded = false;
  {
    MutexLock lock(shared_->mutex);
    if (shared_->unsaid > 0) shared_->queue({.at = clock_.now()});
    shared_->isEnding = true;
    shared_->changed.notifyAll();
    while (!shared_->hasEnded && shared_->written.waitUntil(lock, deadline)) {
    }
    hasEnded = shared_->hasEnded;
  }
  if (hasEnded) {
    thread_.join();
  } else {
    thread_.detach();
  }
}

bool QueuedLog::isEnabled(std::string_view category, LogLevel level) const {
  return shared_->output->isEnabled(category, level);
}

std::optional<LogLevel> QueuedLog::fixedThreshold(std::string_view category) const {
  return shared_->output->fixedThreshold(category);
}

void QueuedLog::write(std::string_view subsystem, std::string_view category, LogLevel level,
                      std::string_view message) {
  Shared::Line line{.at = 0.0,
                    .subsystem = std::string(subsystem),
                    .category = std::string(category),
                    .level = level,
                    .message = std::string(message)};
  const MutexLock lock(shared_->mutex);
  const bool isAlone = shared_->waitingBytes == 0;
  if (!isAlone && shared_->waitingBytes + line.bytes() > limits_.bytes) {
    ++shared_->dropped;
    ++shared_->unsaid;
    return;
  }
  line.at = clock_.now();  // with the lock, so that times do not go back from line to line
  shared_->queue(std::move(line));
}

bool QueuedLog::flush(std::chrono::milliseconds timeout) {
  const auto deadline = std::chrono::steady_clock::now() + timeout;
  MutexLock lock(shared_->mutex);
  if (shared_->unsaid > 0) shared_->queue({.at = clock_.now()});
  const std::uint64_t wanted = shared_->addedLines;
  while (shared_->writtenLines < wanted && shared_->written.waitUntil(lock, deadline)) {
  }
  return shared_->writtenLines >= wanted;
}

SinkStatus QueuedLog::status() const {
  const auto now = std::chrono::steady_clock::now();
  const MutexLock lock(shared_->mutex);
  SinkStatus status{.name = "log",
                    .waiting = shared_->addedLines - shared_->writtenLines,
                    .dropped = shared_->dropped,
                    .hangs = {}};
  const auto still = std::chrono::floor<std::chrono::seconds>(now - shared_->writtenAt);
  if (status.waiting > 0 && still >= kHangTime) status.hangs = still;
  return status;
}

void QueuedLog::writeLinesBeforeFatalSignals() {
  {
    const MutexLock lock(shared_->mutex);
    shared_->isForFatalSignals = true;
    linesBeforeFatalSignals = shared_->addedLines - shared_->writtenLines;
  }
  for (const int number : kFatalSignals) {
    struct sigaction present {};
    if (sigaction(number, nullptr, &present) != 0 || present.sa_handler != SIG_DFL) continue;
    struct sigaction ours {};
    ours.sa_handler = waitForLines;
    ours.sa_flags = static_cast<int>(SA_RESETHAND);
    sigaction(number, &ours, nullptr);
  }
}

}  // namespace tonewerk
