// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <sys/types.h>

namespace tonewerk {

// Stops one thread of a child process while it waits for work, as a thread would stand still that hangs. The
// other threads go on. The thread goes on when the object is destroyed, on the test's thread that made it.
class StoppedThread {
 public:
  // Where the thread waits for work. In a futex a thread may also wait for a lock, so one with an epoll is
  // stopped there only.
  enum class WaitsIn { kEpoll, kFutex };

  // `name` is the thread's, as the kernel has it. Adds a test failure when there is no such thread.
  StoppedThread(pid_t process, const std::string& name, WaitsIn waitsIn);
  StoppedThread(const StoppedThread&) = delete;
  StoppedThread& operator=(const StoppedThread&) = delete;
  ~StoppedThread();

 private:
  pid_t thread_ = -1;
};

}  // namespace tonewerk
