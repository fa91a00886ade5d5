// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <thread>

#include "platform/linux/threads/ThreadSemaphores.h"
#include "support/manual/ManualSemaphores.h"

namespace tonewerk {
namespace {

using std::chrono::hours;
using std::chrono::milliseconds;
using std::chrono::nanoseconds;

struct OfThreads {
  ThreadSemaphores factory;
};
struct Manual {
  ManualClock clock;
  ManualSemaphores factory{clock};
};

// Tests that every semaphore must pass.
template <typename Kind>
class SemaphoreContract : public testing::Test {
 protected:
  Kind kind_;
  std::unique_ptr<Semaphore> semaphore_ = kind_.factory.makeSemaphore();
};

using Kinds = testing::Types<OfThreads, Manual>;
TYPED_TEST_SUITE(SemaphoreContract, Kinds);

TYPED_TEST(SemaphoreContract, BeginsWithoutASignal) {
  EXPECT_FALSE(this->semaphore_->wait(nanoseconds(0)));
  EXPECT_FALSE(this->semaphore_->wait(milliseconds(1)));
}

TYPED_TEST(SemaphoreContract, ASignalBeforeTheWaitEndsIt) {
  this->semaphore_->signal();
  EXPECT_TRUE(this->semaphore_->wait(hours(1)));
  EXPECT_FALSE(this->semaphore_->wait(nanoseconds(0)));
}

TYPED_TEST(SemaphoreContract, SignalsAreCounted) {
  this->semaphore_->signal();
  this->semaphore_->signal();
  EXPECT_TRUE(this->semaphore_->wait(hours(1)));
  EXPECT_TRUE(this->semaphore_->wait(nanoseconds(0)));
  EXPECT_FALSE(this->semaphore_->wait(nanoseconds(0)));
}

TYPED_TEST(SemaphoreContract, EachSemaphoreHasItsOwnSignals) {
  const auto other = this->kind_.factory.makeSemaphore();
  other->signal();
  EXPECT_FALSE(this->semaphore_->wait(nanoseconds(0)));
}

TEST(ThreadSemaphoresTest, ASignalWakesAThreadThatWaits) {
  ThreadSemaphores factory;
  const auto waits = factory.makeSemaphore();
  const auto answers = factory.makeSemaphore();
  std::thread waiter([&] {
    EXPECT_TRUE(waits->wait(hours(1)));
    answers->signal();
  });
  EXPECT_FALSE(answers->wait(milliseconds(1)));
  waits->signal();
  EXPECT_TRUE(answers->wait(hours(1)));
  waiter.join();
}

TEST(ManualSemaphoresTest, AWaitMovesTheClockToItsEnd) {
  ManualClock clock;
  ManualSemaphores factory(clock);
  EXPECT_FALSE(factory.makeSemaphore()->wait(std::chrono::seconds(15)));
  EXPECT_EQ(clock.monotonic(), std::chrono::seconds(15));
}

}  // namespace
}  // namespace tonewerk
