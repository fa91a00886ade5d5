// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/StreamLog.h"

#include <array>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {
namespace {

constexpr double kTime = 1'795'169'880.0;  // 2026-11-20T10:18:00Z

// Both ends of a pipe.
class Pipe {
 public:
  explicit Pipe(int flags = 0) {
    std::array<int, 2> ends{};
    EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC | flags), 0);
    reader_.reset(ends[0]);
    writer_.reset(ends[1]);
  }
  int writer() const { return writer_.get(); }
  // Closes the writing end and reads what was written before, which is at most a pipe's capacity.
  std::string readAll() {
    writer_.reset();
    std::string text;
    std::array<char, 4096> buffer{};
    for (ssize_t count = 0; (count = read(reader_.get(), buffer.data(), buffer.size())) > 0;) {
      text.append(buffer.data(), static_cast<std::size_t>(count));
    }
    return text;
  }

 private:
  FileDescriptor reader_;
  FileDescriptor writer_;
};

TEST(StreamLogTest, ALineIsTimeLevelCategoryAndMessage) {
  EXPECT_EQ(
      StreamLog::format(kTime + 0.125, "twrr", LogLevel::kInfo,
                        logPrefix("src/session/TWReportingSession.cpp", 214) + "start called. reporterID=77"),
      "2026-11-20T10:18:00.125000Z info twrr        TWReportingSession:214   start called. reporterID=77\n");
}

TEST(StreamLogTest, TheTimeAlwaysHasSixDigits) {
  EXPECT_EQ(StreamLog::format(kTime, "twrs", LogLevel::kDefault, "x"),
            "2026-11-20T10:18:00.000000Z default twrs x\n");
  EXPECT_EQ(StreamLog::format(-0.5, "twrs", LogLevel::kError, "x"),
            "1969-12-31T23:59:59.500000Z error twrs x\n");
}

TEST(StreamLogTest, AMessageWithNewlinesIsWrittenUnchanged) {
  Pipe pipe;
  const ManualClock clock(kTime);
  StreamLog(pipe.writer(), clock).write("com.orvane.tonewerk", "twrr", LogLevel::kError, "a\nb");
  EXPECT_EQ(pipe.readAll(), "2026-11-20T10:18:00.000000Z error twrr a\nb\n");
}

TEST(StreamLogTest, LinesOfSeveralThreadsStayWhole) {
  constexpr int kThreads = 4;
  constexpr int kLines = 100;
  Pipe pipe;
  const ManualClock clock(kTime);
  StreamLog log(pipe.writer(), clock);
  {
    std::vector<std::jthread> threads;
    threads.reserve(kThreads);
    for (int thread = 0; thread < kThreads; ++thread) {
      threads.emplace_back([&log, thread] {
        for (int line = 0; line < kLines; ++line) {
          log.write("s", "twrr", LogLevel::kError, std::string(20, static_cast<char>('a' + thread)));
        }
      });
    }
  }
  const std::string text = pipe.readAll();
  std::vector<int> counts(kThreads);
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t end = text.find('\n', at);
    const std::string line = text.substr(at, end - at);
    const char letter = line.back();
    ASSERT_EQ(line, "2026-11-20T10:18:00.000000Z error twrr " + std::string(20, letter));
    ++counts[static_cast<std::size_t>(letter - 'a')];
    at = end + 1;
  }
  EXPECT_EQ(counts, std::vector<int>(kThreads, kLines));
}

TEST(StreamLogTest, ALineThatCannotBeWrittenIsLost) {
  Pipe pipe(O_NONBLOCK);
  const ManualClock clock(kTime);
  StreamLog log(pipe.writer(), clock);
  const std::string page(4096, 'x');
  while (write(pipe.writer(), page.data(), page.size()) > 0) {
  }
  log.write("s", "twrr", LogLevel::kError, "lost");
  EXPECT_EQ(pipe.readAll().find("lost"), std::string::npos);
}

TEST(StreamLogTest, AsksItsThreshold) {
  const ManualClock clock;
  const StreamLog log(-1, clock, LogThreshold(LogLevel::kInfo));
  EXPECT_TRUE(log.isEnabled("twrr", LogLevel::kInfo));
  EXPECT_FALSE(log.isEnabled("twrr", LogLevel::kDebug));
}

}  // namespace
}  // namespace tonewerk
