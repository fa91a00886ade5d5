// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Semaphore.h"

namespace tonewerk {

// Semaphores for threads that sleep. Waits follow the monotonic clock.
class ThreadSemaphores final : public SemaphoreFactory {
 public:
  [[nodiscard]] std::unique_ptr<Semaphore> makeSemaphore() override;
};

}  // namespace tonewerk
