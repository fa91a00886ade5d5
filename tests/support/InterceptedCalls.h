// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <optional>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace tonewerk {

// Decides about a system call: with 0 the kernel executes it, otherwise it fails with that errno.
using InterceptedCallHandler = std::function<int(const seccomp_data& call)>;
// The same, with an answer in place of the kernel's: none has the kernel execute the call, a negative number
// is the errno with which it fails, and any other number is its result.
using AnsweringCallHandler = std::function<std::optional<std::int64_t>(const seccomp_data& call)>;

namespace intercepted_calls {

// Makes the system calls `numbers` of this thread, and of threads that it starts, wait for an answer on the
// returned descriptor. Returns -1 where the system does not allow that.
inline int interceptCalls(const std::vector<long>& numbers) {
  std::vector<sock_filter> filter{BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr))};
  for (const long number : numbers) {
    filter.push_back(BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<__u32>(number), 0, 1));
    filter.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_USER_NOTIF));
  }
  filter.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW));
  const sock_fprog program{static_cast<unsigned short>(filter.size()), filter.data()};
  if (::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) return -1;
  return static_cast<int>(
      ::syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, SECCOMP_FILTER_FLAG_NEW_LISTENER, &program));
}

// Answers intercepted calls until the last thread that makes them has ended.
inline void answerCalls(int calls, const AnsweringCallHandler& handle) {
  for (pollfd waited{calls, POLLIN, 0}; ::poll(&waited, 1, -1) >= 0 || errno == EINTR;) {
    if ((waited.revents & POLLIN) == 0) {
      if (waited.revents != 0) return;
      continue;
    }
    seccomp_notif call{};
    if (::ioctl(calls, SECCOMP_IOCTL_NOTIF_RECV, &call) != 0) continue;
    const std::optional<std::int64_t> result = handle(call.data);
    seccomp_notif_resp answer{};
    answer.id = call.id;
    if (!result) {
      answer.flags = SECCOMP_USER_NOTIF_FLAG_CONTINUE;
    } else if (*result < 0) {
      answer.error = static_cast<__s32>(*result);
    } else {
      answer.val = *result;
    }
    ::ioctl(calls, SECCOMP_IOCTL_NOTIF_SEND, &answer);
  }
}

}  // namespace intercepted_calls

// Intercepts the system calls between an adapter and the kernel. It runs `work` on a thread of its own; each
// of its calls of `number` waits until `handle` has run on the caller's thread.
//
//   const bool isTried = runIntercepted(SYS_fsync, [](const seccomp_data&) { return EIO; }, work);
//   if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
//
// Returns false, without having run `work`, where the system does not allow it.
[[nodiscard]] inline bool runAnswered(const std::vector<long>& numbers, const AnsweringCallHandler& handle,
                                      const std::function<void()>& work) {
  constexpr int kUnknown = -2;
  // Telling the caller makes no call that may be intercepted.
  std::atomic<int> opened = kUnknown;
  std::thread worker([&] {
    const int descriptor = intercepted_calls::interceptCalls(numbers);
    opened = descriptor;
    opened.notify_one();
    if (descriptor >= 0) work();
  });
  opened.wait(kUnknown);
  const int calls = opened;
  if (calls >= 0) {
    intercepted_calls::answerCalls(calls, handle);
    ::close(calls);
  }
  worker.join();
  return calls >= 0;
}

// The same for one call that the kernel executes or that fails.
[[nodiscard]] inline bool runIntercepted(long number, const InterceptedCallHandler& handle,
                                         const std::function<void()>& work) {
  const auto answer = [&handle](const seccomp_data& call) -> std::optional<std::int64_t> {
    const int error = handle(call);
    return error == 0 ? std::nullopt : std::optional<std::int64_t>(-error);
  };
  return runAnswered({number}, answer, work);
}

}  // namespace tonewerk
