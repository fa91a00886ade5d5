// SPDX-License-Identifier: Apache-2.0
//
// Tests strands whose pieces run on two threads in turn.
#include <gtest/gtest.h>
#include <memory>

#include "platform/linux/threads/ThreadQueue.h"
#include "session/StrandPool.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

TEST(StrandThreadsTest, NoTwoPiecesRunAtTheSameTime) {
  MemoryLog lines;
  const LogCategory log(lines, "com.orvane.tonewerk", "twri");
  StrandPool pool(std::make_unique<ThreadQueue>("strands", QueuePriority::kUtility), "linkReport", log);
  const auto strand = pool.makeStrand();
  int count = 0;  // guarded by the strand alone
  std::size_t runAtOnce = 0;
  constexpr int kPieces = 20'000;
  for (int piece = 0; piece < kPieces; ++piece) {
    if (piece % 7 == 0) strand->interrupt([&count] { ++count; });
    if (strand->runAtOnce([&count] { ++count; })) {
      ++runAtOnce;
    } else {
      strand->submit(0, [&count] { ++count; });
    }
    if (piece % 16 == 0) pool.drain();
  }
  pool.drain();
  EXPECT_EQ(count, kPieces + (kPieces + 6) / 7);
  EXPECT_GT(runAtOnce, 0U);
}

}  // namespace
}  // namespace tonewerk
