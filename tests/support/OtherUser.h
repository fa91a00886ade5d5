// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>

namespace tonewerk {

// A user that is neither root nor the user that tests run as: nobody.
inline constexpr std::uint32_t kOtherUser = 65'534;

// Runs `work` as `user`, on a thread of its own, and returns when it has run. Only root can call it.
inline void runAsUser(std::uint32_t user, const std::function<void()>& work) {
  std::thread otherUser([user, &work] {
    // The system call changes only this thread; the library's function would change all threads.
    ASSERT_EQ(::syscall(SYS_setresuid, -1, user, -1), 0);
    work();
  });
  otherUser.join();
}
inline void runAsOtherUser(const std::function<void()>& work) { runAsUser(kOtherUser, work); }

}  // namespace tonewerk
