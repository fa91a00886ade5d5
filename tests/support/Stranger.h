// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>

namespace tonewerk {

// A user who is neither root nor, where tests run as root, the one that they run as: nobody.
inline constexpr std::uint32_t kStranger = 65'534;

// Runs `work` as that user, on a thread of its own, and returns when it has run. For root only.
inline void runAsStranger(const std::function<void()>& work) {
  std::thread stranger([&work] {
    // The system call itself changes this thread alone; the library's function would change them all.
    ASSERT_EQ(::syscall(SYS_setresuid, -1, kStranger, -1), 0);
    work();
  });
  stranger.join();
}

}  // namespace tonewerk
