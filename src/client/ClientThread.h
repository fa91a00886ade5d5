// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <pthread.h>

namespace tonewerk {

// A thread with a name and without signals, which are the program's business.
//
// Not std::thread: in a child process the object is there and the thread is not, and then nothing must be
// done about it.
class ClientThread {
 public:
  using Function = void (*)(void* argument);

  // False when there can be no thread. Once.
  bool start(const char* name, Function function, void* argument);
  bool isRunning() const { return isRunning_; }
  bool isThisThread() const { return isRunning_ && ::pthread_equal(thread_, ::pthread_self()) != 0; }
  void join();
  // In a child process.
  void forget() { isRunning_ = false; }

 private:
  static void* run(void* self);

  pthread_t thread_{};
  bool isRunning_ = false;
  Function function_ = nullptr;
  void* argument_ = nullptr;
};

}  // namespace tonewerk
