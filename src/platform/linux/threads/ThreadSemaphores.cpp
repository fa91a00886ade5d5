// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/ThreadSemaphores.h"

#include <cstddef>

#include "values/Mutex.h"

namespace tonewerk {
namespace {

// Replaces std::counting_semaphore: that of g++ 12 can miss a signal.
class ThreadSemaphore final : public Semaphore {
 public:
  void signal() override {
    const MutexLock lock(mutex_);
    ++count_;
    signalled_.notifyOne();
  }

  [[nodiscard]] bool wait(std::chrono::nanoseconds timeout) override {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    MutexLock lock(mutex_);
    while (count_ == 0 && signalled_.waitUntil(lock, deadline)) {
    }
    if (count_ == 0) return false;
    --count_;
    return true;
  }

 private:
  Mutex mutex_;
  Condition signalled_;
  std::size_t count_ GUARDED_BY(mutex_) = 0;
};

}  // namespace

std::unique_ptr<Semaphore> ThreadSemaphores::makeSemaphore() { return std::make_unique<ThreadSemaphore>(); }

}  // namespace tonewerk
