// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/LiveEvents.h"

#include <array>
#include <csignal>
#include <gtest/gtest.h>
#include <string_view>
#include <unistd.h>

namespace tonewerk {
namespace {

using Event = LiveEvents::Event;

class Pipe {
 public:
  Pipe() {
    std::array<int, 2> ends{};
    EXPECT_EQ(::pipe(ends.data()), 0);
    reading = FileDescriptor(ends[0]);
    writing = FileDescriptor(ends[1]);
  }
  void write(std::string_view text) const {
    EXPECT_EQ(::write(writing.get(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
  }
  FileDescriptor reading;
  FileDescriptor writing;
};

LiveEvents::Time now() { return std::chrono::steady_clock::now(); }

TEST(LiveEventsTest, TellsThatTheTimeHasCome) {
  LiveEvents events(-1, -1);
  EXPECT_EQ(events.wait(-1, now()), Event::kTime);
}

TEST(LiveEventsTest, TellsWhatIsReadable) {
  const Pipe pipe;
  LiveEvents events(-1, -1);
  EXPECT_EQ(events.wait(pipe.reading.get(), now()), Event::kTime);
  pipe.write("x");
  EXPECT_EQ(events.wait(pipe.reading.get(), std::nullopt), Event::kReadable);
}

TEST(LiveEventsTest, TellsOfEachKey) {
  const Pipe keys;
  LiveEvents events(keys.reading.get(), -1);
  keys.write("aq");
  EXPECT_EQ(events.wait(-1, std::nullopt), Event::kKey);
  EXPECT_EQ(events.key(), 'a');
  EXPECT_EQ(events.wait(-1, std::nullopt), Event::kKey);
  EXPECT_EQ(events.key(), 'q');
}

TEST(LiveEventsTest, ContinuesWithoutKeysAfterTheEndOfTheInput) {
  Pipe keys;
  LiveEvents events(keys.reading.get(), -1);
  keys.writing.reset();
  EXPECT_EQ(events.wait(-1, now()), Event::kTime);
  EXPECT_EQ(events.wait(-1, now()), Event::kTime);
}

TEST(LiveEventsTest, IsStoppedForGoodByASignal) {
  for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGQUIT}) {
    LiveEvents events(-1, -1);
    std::raise(signal);
    EXPECT_EQ(events.wait(-1, std::nullopt), Event::kStopped);
    EXPECT_EQ(events.wait(-1, now()), Event::kStopped);
  }
}

TEST(LiveEventsTest, IsStoppedWhenTheOutputsReaderHasClosedIt) {
  Pipe output;
  LiveEvents events(-1, output.writing.get());
  EXPECT_EQ(events.wait(-1, now()), Event::kTime);
  output.reading.reset();
  EXPECT_EQ(events.wait(-1, std::nullopt), Event::kStopped);
}

TEST(LiveEventsTest, TellsEachTimeThatTheWindowHasAnotherSize) {
  LiveEvents events(-1, -1);
  for (int times = 0; times < 2; ++times) {
    std::raise(SIGWINCH);
    EXPECT_EQ(events.wait(-1, std::nullopt), Event::kResized);
  }
  EXPECT_EQ(events.wait(-1, now()), Event::kTime);
}

TEST(LiveEventsTest, LetsTheSecondSignalEndTheProcess) {
  EXPECT_EXIT(
      {
        const LiveEvents events(-1, -1);
        std::raise(SIGTERM);
        std::raise(SIGTERM);
      },
      testing::KilledBySignal(SIGTERM), "");
}

TEST(LiveEventsTest, RestoresSignalHandlers) {
  static volatile std::sig_atomic_t count = 0;
  const auto before = std::signal(SIGINT, [](int) { count = count + 1; });
  { const LiveEvents events(-1, -1); }
  std::raise(SIGINT);
  EXPECT_EQ(count, 1);
  std::signal(SIGINT, before);
}

}  // namespace
}  // namespace tonewerk
