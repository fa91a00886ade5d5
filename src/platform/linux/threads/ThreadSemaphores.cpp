// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/ThreadSemaphores.h"

#include <condition_variable>
#include <cstddef>
#include <mutex>

namespace tonewerk {
namespace {

// Not the library's own: g++ 12's can sleep through a signal.
class ThreadSemaphore final : public Semaphore {
 public:
  void signal() override {
    const std::lock_guard lock(mutex_);
    ++count_;
    signalled_.notify_one();
  }

  bool wait(std::chrono::nanoseconds timeout) override {
    std::unique_lock lock(mutex_);
    if (!signalled_.wait_for(lock, timeout, [this] { return count_ > 0; })) return false;
    --count_;
    return true;
  }

 private:
  std::mutex mutex_;
  std::condition_variable signalled_;
  std::size_t count_ = 0;  // guarded by mutex_
};

}  // namespace

std::unique_ptr<Semaphore> ThreadSemaphores::makeSemaphore() { return std::make_unique<ThreadSemaphore>(); }

}  // namespace tonewerk
