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

// What becomes of a system call: 0 lets the kernel have it, else it fails with that errno.
using InterceptedCallHandler = std::function<int(const seccomp_data& call)>;

namespace intercepted_calls {

// This thread's calls of `number` (and of the threads it starts) wait for what is read from the descriptor
// that is returned; -1 where the system does not allow that.
inline int waitForOrders(long number) {
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

// Until the last thread that waits for orders has ended.
inline void giveOrders(int calls, const InterceptedCallHandler& handle) {
  for (pollfd waited{calls, POLLIN, 0}; ::poll(&waited, 1, -1) >= 0 || errno == EINTR;) {
    if ((waited.revents & POLLIN) == 0) {
      if (waited.revents != 0) return;
      continue;
    }
    seccomp_notif call{};
    if (::ioctl(calls, SECCOMP_IOCTL_NOTIF_RECV, &call) != 0) continue;
    const int error = handle(call.data);
    seccomp_notif_resp order{};
    order.id = call.id;
    order.error = -error;
    if (error == 0) order.flags = SECCOMP_USER_NOTIF_FLAG_CONTINUE;
    ::ioctl(calls, SECCOMP_IOCTL_NOTIF_SEND, &order);
  }
}

}  // namespace intercepted_calls

// Puts a test between an adapter and the kernel: runs `work` on a thread of its own, and `handle` on the
// caller's at each of its calls of `number`, which waits meanwhile.
//
//   const bool isTried = runIntercepted(SYS_fsync, [](const seccomp_data&) { return EIO; }, work);
//   if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
//
// False, and `work` has not run, where the system does not allow it.
[[nodiscard]] inline bool runIntercepted(long number, const InterceptedCallHandler& handle,
                                         const std::function<void()>& work) {
  std::promise<int> opened;
  std::thread worker([&] {
    const int calls = intercepted_calls::waitForOrders(number);
    opened.set_value(calls);
    if (calls >= 0) work();
  });
  const int calls = opened.get_future().get();
  if (calls >= 0) {
    intercepted_calls::giveOrders(calls, handle);
    ::close(calls);
  }
  worker.join();
  return calls >= 0;
}

}  // namespace tonewerk
