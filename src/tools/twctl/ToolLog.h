// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Log.h"
#include "tools/twctl/Tool.h"

namespace tonewerk {

// Prints the errors that the adapters log, for people.
class ToolLog final : public Log {
 public:
  explicit ToolLog(const Tool& tool) : tool_(tool) {}

  bool isEnabled(std::string_view /*category*/, LogLevel level) const override {
    return level == LogLevel::kError;
  }
  void write(std::string_view subsystem, std::string_view category, LogLevel level,
             std::string_view message) override;

 private:
  const Tool& tool_;
};

}  // namespace tonewerk
