// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Semaphore.h"

namespace tonewerk {

// Makes semaphores on which threads block. Time-outs follow the monotonic clock.
class ThreadSemaphores final : public SemaphoreFactory {
 public:
  [[nodiscard]] std::unique_ptr<Semaphore> makeSemaphore() override;
};

}  // namespace tonewerk
