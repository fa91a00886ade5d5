// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cerrno>
#include <cstddef>
#include <functional>
#include <future>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>

namespace tonewerk {

// Decides about a system call: with 0 the kernel executes it, otherwise it fails with that errno.
using InterceptedCallHandler = std::function<int(const seccomp_data& call)>;

namespace intercepted_calls {

// Makes system call `number` of this thread, and of threads that it starts, wait for an answer on the
// returned descriptor. Returns -1 where the system does not allow that.
inline int interceptCalls(long number) {
  sock_filter filter[] = {
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<__u32>(number), 0, 1),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_USER_NOTIF),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
  };
  const sock_fprog program{sizeof(filter) / sizeof(filter[0]), filter};
  if (::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) return -1;
  return static_cast<int>(
      ::syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, SECCOMP_FILTER_FLAG_NEW_LISTENER, &program));
}

// Answers intercepted calls until the last thread that makes them has ended.
inline void answerCalls(int calls, const InterceptedCallHandler& handle) {
  for (pollfd waited{calls, POLLIN, 0}; ::poll(&waited, 1, -1) >= 0 || errno == EINTR;) {
    if ((waited.revents & POLLIN) == 0) {
      if (waited.revents != 0) return;
      continue;
    }
    seccomp_notif call{};
    if (::ioctl(calls, SECCOMP_IOCTL_NOTIF_RECV, &call) != 0) continue;
    const int error = handle(call.data);
    seccomp_notif_resp answer{};
    answer.id = call.id;
    answer.error = -error;
    if (error == 0) answer.flags = SECCOMP_USER_NOTIF_FLAG_CONTINUE;
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
[[nodiscard]] inline bool runIntercepted(long number, const InterceptedCallHandler& handle,
                                         const std::function<void()>& work) {
  std::promise<int> opened;
  std::thread worker([&] {
    const int calls = intercepted_calls::interceptCalls(number);
    opened.set_value(calls);
    if (calls >= 0) work();
  });
  const int calls = opened.get_future().get();
  if (calls >= 0) {
    intercepted_calls::answerCalls(calls, handle);
    ::close(calls);
  }
  worker.join();
  return calls >= 0;
}

}  // namespace tonewerk
