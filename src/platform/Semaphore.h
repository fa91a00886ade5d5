// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>

namespace tonewerk {

// A counting semaphore, for the few who wait by design. Any thread.
class Semaphore {
 public:
  virtual ~Semaphore() = default;

  // Lets one wait() go on: one that waits, or the next one.
  virtual void signal() = 0;

  // Takes one signal, and blocks the calling thread until there is one; false when `timeout` passed without.
  [[nodiscard]] virtual bool wait(std::chrono::nanoseconds timeout) = 0;
};

class SemaphoreFactory {
 public:
  virtual ~SemaphoreFactory() = default;

  // Without a signal.
  [[nodiscard]] virtual std::unique_ptr<Semaphore> makeSemaphore() = 0;
};

}  // namespace tonewerk
