// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Log.h"

namespace tonewerk {

// Where log lines end. A line may be written later than it was logged.
class LogOutput : public Log {
 public:
  // Like write(), for a line that was logged `at`, in seconds since 1970.
  virtual void writeAt(double at, std::string_view subsystem, std::string_view category, LogLevel level,
                       std::string_view message) = 0;
};

}  // namespace tonewerk
