// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk {

// In ascending order of weight.
enum class LogLevel { kDebug, kInfo, kDefault, kError };

// "debug", "info", "default" or "error".
std::string_view textOf(LogLevel level);

// Where log lines go. Any thread; a line is written whole.
class Log {
 public:
  virtual ~Log() = default;

  // Whether a line of this category code (such as "twrr") and level would be written. Cheap: asked for every
  // line before it is formatted.
  virtual bool isEnabled(std::string_view category, LogLevel level) const = 0;

  // `message` as it is to be read, prefix included. `subsystem` as "com.orvane.tonewerk". Never fails: what
  // cannot be written is lost.
  virtual void write(std::string_view subsystem, std::string_view category, LogLevel level,
                     std::string_view message) = 0;
};

}  // namespace tonewerk
