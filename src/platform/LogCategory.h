// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "platform/Log.h"

namespace tonewerk {

// One area of the daemon in the log. Any thread.
class LogCategory {
 public:
  // `log` outlives the category.
  LogCategory(Log& log, std::string_view subsystem, std::string_view code)
      : log_(log), subsystem_(subsystem), code_(code) {}
  LogCategory(const LogCategory&) = delete;
  LogCategory& operator=(const LogCategory&) = delete;

  bool isEnabled(LogLevel level) const { return log_.isEnabled(code_, level); }
  void write(LogLevel level, std::string_view message) const {
    log_.write(subsystem_, code_, level, message);
  }

  std::string_view subsystem() const { return subsystem_; }
  std::string_view code() const { return code_; }

  // For the platform's use; starts at zero.
  std::uint64_t word = 0;

 private:
  Log& log_;
  const std::string subsystem_;
  const std::string code_;
};

}  // namespace tonewerk
