// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireLoop.h"

#include <array>
#include <csignal>
#include <gtest/gtest.h>
#include <pipewire/pipewire.h>
#include <unistd.h>

namespace tonewerk {
namespace {

struct Library {
  Library() { pw_init(nullptr, nullptr); }
  Library(const Library&) = delete;
  Library& operator=(const Library&) = delete;
  ~Library() { pw_deinit(); }
};

class PipeWireLoopTest : public ::testing::Test {
 protected:
  PipeWireLoopTest() {
    timeout = loop->makeTimer([this] {
      ADD_FAILURE() << "nothing came";
      loop->quit();
    });
    timeout->arm(std::chrono::seconds(20));
  }

  Library library;
  std::unique_ptr<PipeWireLoop> loop = PipeWireLoop::make();
  std::unique_ptr<EventLoop::Timer> timeout;
};

TEST_F(PipeWireLoopTest, RunsATimerOnceForEachArming) {
  int expired = 0;
  std::unique_ptr<EventLoop::Timer> timer = loop->makeTimer([&] {
    if (++expired == 3) return loop->quit();
    timer->arm(std::chrono::nanoseconds(-1));
  });
  timer->arm(std::chrono::nanoseconds(0));
  loop->run();
  EXPECT_EQ(expired, 3);
}

TEST_F(PipeWireLoopTest, DoesNotRunADisarmedOrDestroyedTimer) {
  const auto unwanted = [] { FAIL() << "this timer was stopped"; };
  std::unique_ptr<EventLoop::Timer> disarmed = loop->makeTimer(unwanted);
  std::unique_ptr<EventLoop::Timer> destroyed = loop->makeTimer(unwanted);
  std::unique_ptr<EventLoop::Timer> last = loop->makeTimer([this] { loop->quit(); });
  disarmed->arm(std::chrono::milliseconds(1));
  destroyed->arm(std::chrono::milliseconds(1));
  disarmed->disarm();
  destroyed.reset();
  last->arm(std::chrono::milliseconds(20));
  loop->run();
}

TEST_F(PipeWireLoopTest, StopsWatchingWhenASourceIsDestroyedInItsOwnCallback) {
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe(ends.data()), 0);
  int calls = 0;
  std::unique_ptr<EventLoop::Source> source;
  std::unique_ptr<EventLoop::Timer> last = loop->makeTimer([this] { loop->quit(); });
  source = loop->watch(ends[0], [&] {
    ++calls;
    source.reset();
    last->arm(std::chrono::milliseconds(20));
  });
  ASSERT_NE(source, nullptr);
  EXPECT_EQ(write(ends[1], "x", 1), 1);
  loop->run();
  EXPECT_EQ(calls, 1);
  close(ends[0]);
  close(ends[1]);
}

TEST_F(PipeWireLoopTest, RunsTheCallbackWhenADescriptorsPeerIsGone) {
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe(ends.data()), 0);
  const std::unique_ptr<EventLoop::Source> source = loop->watch(ends[0], [this] { loop->quit(); });
  ASSERT_NE(source, nullptr);
  close(ends[1]);
  loop->run();
  close(ends[0]);
}

TEST_F(PipeWireLoopTest, RefusesAnInvalidDescriptor) {
  EXPECT_EQ(loop->watch(-1, [] {}), nullptr);
}

TEST_F(PipeWireLoopTest, RunsTheCallbackForASignal) {
  const std::unique_ptr<EventLoop::Source> source = loop->watchSignal(SIGUSR1, [this] { loop->quit(); });
  ASSERT_NE(source, nullptr);
  ASSERT_EQ(kill(getpid(), SIGUSR1), 0);
  loop->run();
}

}  // namespace
}  // namespace tonewerk
