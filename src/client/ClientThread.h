// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <pthread.h>

namespace tonewerk {

// A thread with a name and without signals, which are the program's business.
//
// This is not a std::thread because a forked child process has the object but not the thread, and must be
// able to drop the object then. A copy stands for the same thread.
class ClientThread {
 public:
  using Function = void (*)(void* argument);

  // False when there can be no thread. Once.
  [[nodiscard]] bool start(const char* name, Function function, void* argument);
  bool isRunning() const { return isRunning_; }
  bool isThisThread() const { return isRunning_ && ::pthread_equal(thread_, ::pthread_self()) != 0; }
  // Waits for the thread's end; isRunning() stays. Once, and any thread but this one.
  void join() const { ::pthread_join(thread_, nullptr); }
  // After join(), or in a child process.
  void forget() { isRunning_ = false; }

  // Whether the calling thread is one of these.
  static bool isCurrent();
  // In a child process that one of these has forked: the caller is an ordinary thread there.
  static void becomeForked();

 private:
  static void* run(void* self);

  pthread_t thread_{};
  bool isRunning_ = false;
  Function function_ = nullptr;
  void* argument_ = nullptr;
};

}  // namespace tonewerk
