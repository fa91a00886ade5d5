// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/Log.h"
#include "tools/twctl/Tool.h"

namespace tonewerk {

// What the adapters that the tool uses have to say goes to people, errors only.
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
