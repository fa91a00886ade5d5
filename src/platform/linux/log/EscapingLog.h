// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/linux/log/LogLayer.h"

namespace tonewerk {

// Passes lines on to another log, with control characters and other unprintable ones escaped
// (values/PrintableText.h). So a name or a value from a client can neither begin another line nor control a
// terminal that shows the log. Line feeds stay inside a scope of platform/LogLines.h.
class EscapingLog final : public LogLayer {
 public:
  explicit EscapingLog(std::unique_ptr<Log> log);
  ~EscapingLog() override;

  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;
};

}  // namespace tonewerk
