// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>
#include <system_error>

#include "values/UniqueFunction.h"

namespace tonewerk {

// Starts threads for single pieces of work that take long. Any thread.
class DetachedThreads {
 public:
  virtual ~DetachedThreads() = default;

  // Runs `work` on a thread of its own for which nobody waits. The caller must keep alive everything that
  // `work` uses. After an error `work` has not run. `name` is for people, at most 15 bytes.
  [[nodiscard]] virtual std::error_code start(std::string_view name, Task work) = 0;
};

}  // namespace tonewerk
