// SPDX-License-Identifier: Apache-2.0
#include "support/manual/ManualSemaphores.h"

#include "values/Mutex.h"

namespace tonewerk {
namespace {

class ManualSemaphore final : public Semaphore {
 public:
  explicit ManualSemaphore(ManualClock& clock) : clock_(clock) {}

  void signal() override {
    const MutexLock lock(mutex_);
    ++count_;
  }

  [[nodiscard]] bool wait(std::chrono::nanoseconds timeout) override {
    return clock_.advanceUntil(timeout, [this] { return take(); });
  }

 private:
  [[nodiscard]] bool take() {
    const MutexLock lock(mutex_);
    if (count_ == 0) return false;
    --count_;
    return true;
  }

  ManualClock& clock_;
  Mutex mutex_;
  int count_ GUARDED_BY(mutex_) = 0;
};

}  // namespace

std::unique_ptr<Semaphore> ManualSemaphores::makeSemaphore() {
  return std::make_unique<ManualSemaphore>(clock_);
}

}  // namespace tonewerk
