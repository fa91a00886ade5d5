// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/DetachedThreads.h"

namespace tonewerk {

// Threads behind everything a user waits for, as is what they start.
class LinuxDetachedThreads final : public DetachedThreads {
 public:
  [[nodiscard]] std::error_code start(std::string_view name, Task work) override;
};

}  // namespace tonewerk
