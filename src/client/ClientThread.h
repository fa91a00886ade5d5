// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <pthread.h>

namespace tonewerk {

// Runs a thread that has a name and blocks all signals, so that the program's own threads handle them.
//
// This is not a std::thread because a forked child process has the object but not the thread, and must be
// able to drop the object then. A copy stands for the same thread.
class ClientThread {
 public:
  using Function = void (*)(void* argument);

  // False when no thread can be started. May be called once.
  [[nodiscard]] bool start(const char* name, Function function, void* argument);
  bool isRunning() const { return isRunning_; }
  bool isThisThread() const { return isRunning_ && ::pthread_equal(thread_, ::pthread_self()) != 0; }
  // Waits for the end of the thread. isRunning() stays true. May be called once, on any thread but this one.
  void join() const { ::pthread_join(thread_, nullptr); }
  // Makes isRunning() false. After join(), or in a forked child process.
  void forget() { isRunning_ = false; }

  // True when the calling thread is a ClientThread.
  static bool isCurrent();
  // Makes the caller an ordinary thread. For a child process that a ClientThread has forked.
  static void becomeForked();

 private:
  static void* run(void* self);

  pthread_t thread_{};
  bool isRunning_ = false;
  Function function_ = nullptr;
  void* argument_ = nullptr;
};

}  // namespace tonewerk
