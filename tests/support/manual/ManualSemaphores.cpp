// SPDX-License-Identifier: Apache-2.0
#include "support/manual/ManualSemaphores.h"

#include <mutex>

namespace tonewerk {
namespace {

class ManualSemaphore final : public Semaphore {
 public:
  explicit ManualSemaphore(ManualClock& clock) : clock_(clock) {}

  void signal() override {
    const std::lock_guard lock(mutex_);
    ++count_;
  }

  bool wait(std::chrono::nanoseconds timeout) override {
    return clock_.advanceUntil(timeout, [this] { return take(); });
  }

 private:
  bool take() {
    const std::lock_guard lock(mutex_);
    if (count_ == 0) return false;
    --count_;
    return true;
  }

  ManualClock& clock_;
  std::mutex mutex_;
  int count_ = 0;  // guarded by mutex_
};

}  // namespace

std::unique_ptr<Semaphore> ManualSemaphores::makeSemaphore() {
  return std::make_unique<ManualSemaphore>(clock_);
}

}  // namespace tonewerk
