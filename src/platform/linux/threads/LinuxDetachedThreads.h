// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/DetachedThreads.h"

namespace tonewerk {

// Starts threads with a lower priority than everything a user waits for. Processes that they start inherit
// it.
class LinuxDetachedThreads final : public DetachedThreads {
 public:
  [[nodiscard]] std::error_code start(std::string_view name, Task work) override;
};

}  // namespace tonewerk
