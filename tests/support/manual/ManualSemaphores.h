// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/Semaphore.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {

// Makes semaphores whose waits move the test's clock instead of blocking: up to the signal, which something
// that becomes due may give, or else to the end of the timeout.
//
//   test.runtrace.onStart({MemoryRuntrace::didStart().after(14s)});
//   session->start();                        // waits: 14 s later the callback comes
//
// A wait must be on the thread that moves the clock; any thread may signal.
class ManualSemaphores final : public SemaphoreFactory {
 public:
  // `clock` outlives the semaphores.
  explicit ManualSemaphores(ManualClock& clock) : clock_(clock) {}

  [[nodiscard]] std::unique_ptr<Semaphore> makeSemaphore() override;

 private:
  ManualClock& clock_;
};

}  // namespace tonewerk
