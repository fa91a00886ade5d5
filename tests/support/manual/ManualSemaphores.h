// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/Semaphore.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {

// Semaphores whose waits move the test's clock instead of blocking: up to the signal, which something that is
// due on the way gives, or else to the end of the time-out.
//
//   test.runtrace.onStart({MemoryRuntrace::didStart().after(14s)});
//   session->start();                        // waits: 14 s later the callback comes
//
// Waits happen on the thread that moves the clock; signals come from any.
class ManualSemaphores final : public SemaphoreFactory {
 public:
  // `clock` outlives the semaphores.
  explicit ManualSemaphores(ManualClock& clock) : clock_(clock) {}

  [[nodiscard]] std::unique_ptr<Semaphore> makeSemaphore() override;

 private:
  ManualClock& clock_;
};

}  // namespace tonewerk
