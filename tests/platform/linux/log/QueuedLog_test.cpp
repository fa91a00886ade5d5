// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/QueuedLog.h"

#include <array>
#include <atomic>
#include <cassert>
#include <csignal>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/linux/log/StreamLog.h"
#include "support/manual/ManualClock.h"
#include "values/Mutex.h"

using namespace std::chrono_literals;

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::IsEmpty;
using ::testing::SizeIs;

// Holds lines, and hangs when a test asks for it.
class HangingOutput final : public LogOutput {
 public:
  struct State {
    Mutex mutex;
    Condition changed;
    bool hangs GUARDED_BY(mutex) = false;
    bool isInside GUARDED_BY(mutex) = false;  // a line is being written
    std::vector<std::string> lines GUARDED_BY(mutex);
    std::vector<double> times GUARDED_BY(mutex);

    void setHangs(bool now) {
      const MutexLock lock(mutex);
      hangs = now;
      changed.notifyAll();
    }
    void waitUntilInside() {
      MutexLock lock(mutex);
      while (!isInside) changed.wait(lock);
    }
    std::vector<std::string> written() {
      const MutexLock lock(mutex);
      return lines;
    }
  };

  explicit HangingOutput(std::shared_ptr<State> state) : state_(std::move(state)) {}

  bool isEnabled(std::string_view, LogLevel level) const override { return level >= LogLevel::kDefault; }
  std::optional<LogLevel> fixedThreshold(std::string_view) const override { return LogLevel::kDefault; }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override {
    writeAt(0.0, subsystem, category, level, message);
  }
  void writeAt(double at, std::string_view, std::string_view, LogLevel, std::string_view message) override {
    MutexLock lock(state_->mutex);
    state_->isInside = true;
    state_->changed.notifyAll();
    while (state_->hangs) state_->changed.wait(lock);
    state_->isInside = false;
    state_->lines.emplace_back(message);
    state_->times.push_back(at);
  }

 private:
  const std::shared_ptr<State> state_;
};

class QueuedLogTest : public testing::Test {
 protected:
  void make(const QueuedLog::Limits& limits = {}) {
    log = std::make_unique<QueuedLog>(std::make_unique<HangingOutput>(output), clock, limits);
  }
  void write(const std::string& message) {
    log->write("com.orvane.tonewerk", "twrs", LogLevel::kError, message);
  }
  // Returns when the output hangs in this line.
  void hangIn(const std::string& message) {
    output->setHangs(true);
    write(message);
    output->waitUntilInside();
  }

  ManualClock clock;
  const std::shared_ptr<HangingOutput::State> output = std::make_shared<HangingOutput::State>();
  std::unique_ptr<QueuedLog> log;
};

TEST_F(QueuedLogTest, WritesLinesInOrderWithTheTimeAtWhichTheyWereLogged) {
  make();
  clock.setNow(100.0);
  hangIn("a");
  clock.setNow(101.0);
  write("b");
  clock.setNow(200.0);
  output->setHangs(false);
  EXPECT_TRUE(log->flush(1h));
  EXPECT_THAT(output->written(), ElementsAre("a", "b"));
  const MutexLock lock(output->mutex);
  EXPECT_THAT(output->times, ElementsAre(100.0, 101.0));
}

TEST_F(QueuedLogTest, AsksTheOutputWhatIsWritten) {
  make();
  EXPECT_TRUE(log->isEnabled("twrs", LogLevel::kError));
  EXPECT_FALSE(log->isEnabled("twrs", LogLevel::kInfo));
  EXPECT_EQ(log->fixedThreshold("twrs"), LogLevel::kDefault);
}

// Once, whoever wrote the line waited as long as the disk of the log did.
TEST_F(QueuedLogTest, NobodyWaitsForALogThatHangs) {
  make();
  hangIn("first");
  write("second");
  EXPECT_THAT(output->written(), IsEmpty());
  output->setHangs(false);
}

TEST_F(QueuedLogTest, DropsLinesPastItsBoundAndSaysHowManyWhereTheyAreMissing) {
  make({.bytes = 1000});
  hangIn("first");
  write(std::string(500, 'x'));
  write("dropped" + std::string(500, 'x'));
  write("dropped, too" + std::string(500, 'x'));
  EXPECT_EQ(log->status().dropped, 2U);
  EXPECT_EQ(log->status().waiting, 2U);
  output->setHangs(false);
  EXPECT_TRUE(log->flush(1h));
  write("last");
  EXPECT_TRUE(log->flush(1h));
  EXPECT_THAT(output->written(), ElementsAre("first", std::string(500, 'x'),
                                             "log lines dropped, because writing the log hangs: 2", "last"));
}

TEST_F(QueuedLogTest, TakesALineThatIsLargerThanItsBoundWhenItIsEmpty) {
  make({.bytes = 10});
  write(std::string(500, 'x'));
  EXPECT_TRUE(log->flush(1h));
  EXPECT_THAT(output->written(), SizeIs(1));
}

TEST_F(QueuedLogTest, FlushDoesNotWaitForEver) {
  make();
  hangIn("first");
  EXPECT_FALSE(log->flush(1ms));
  output->setHangs(false);
}

TEST_F(QueuedLogTest, TheDestructorWritesWhatIsQueued) {
  make();
  for (int line = 0; line < 1000; ++line) write(std::to_string(line));
  log.reset();
  EXPECT_THAT(output->written(), SizeIs(1000));
}

TEST_F(QueuedLogTest, TheDestructorGivesUpAnOutputThatHangs) {
  make({.end = 1ms});
  hangIn("first");
  log.reset();
  output->setHangs(false);  // the thread that was left behind ends by itself
  while (output->written().empty()) std::this_thread::yield();
}

TEST_F(QueuedLogTest, LinesOfManyThreadsKeepTheirOrderInEachThread) {
  make();
  std::vector<std::thread> threads;
  threads.reserve(4);
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([this, thread] {
      for (int line = 0; line < 200; ++line)
        write(std::string(1, static_cast<char>('a' + thread)) + std::to_string(line));
    });
  }
  for (std::thread& thread : threads) thread.join();
  log.reset();
  std::array<int, 4> next{};
  for (const std::string& line : output->written()) {
    EXPECT_EQ(line.substr(1), std::to_string(next.at(static_cast<std::size_t>(line[0] - 'a'))++));
  }
  EXPECT_THAT(next, testing::Each(200));
}

// A crash right after a line must not take the line along: it says most about the crash.
TEST(QueuedLogSignals, AFatalSignalWaitsForTheLines) {
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
  const pid_t child = ::fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    ::signal(SIGABRT, SIG_DFL);
    const ManualClock clock;
    QueuedLog log(std::make_unique<StreamLog>(ends[1], clock), clock);
    log.writeLinesBeforeFatalSignals();
    for (int line = 0; line < 100; ++line) {
      log.write("com.orvane.tonewerk", "twrs", LogLevel::kError, "line " + std::to_string(line));
    }
    std::abort();
  }
  ::close(ends[1]);
  std::string text;
  std::array<char, 4096> buffer{};
  for (ssize_t count = 0; (count = ::read(ends[0], buffer.data(), buffer.size())) > 0;) {
    text.append(buffer.data(), static_cast<std::size_t>(count));
  }
  ::close(ends[0]);
  int status = 0;
  ASSERT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFSIGNALED(status));
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
  EXPECT_THAT(text, EndsWith("line 99\n"));
}

}  // namespace
}  // namespace tonewerk
