// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>

namespace tonewerk {

// A counting semaphore, for code that blocks by design. Any thread.
class Semaphore {
 public:
  virtual ~Semaphore() = default;

  // Releases one wait(): a current one, or the next one.
  virtual void signal() = 0;

  // Takes one signal and blocks the calling thread until there is one. Returns false when there was none
  // within `timeout`.
  [[nodiscard]] virtual bool wait(std::chrono::nanoseconds timeout) = 0;
};

class SemaphoreFactory {
 public:
  virtual ~SemaphoreFactory() = default;

  // Makes a semaphore without a signal.
  [[nodiscard]] virtual std::unique_ptr<Semaphore> makeSemaphore() = 0;
};

}  // namespace tonewerk
