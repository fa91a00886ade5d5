// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "platform/linux/commands/BoundedCommand.h"
#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"

namespace tonewerk {

// Collects PipeWire's graph as pw-dump prints it.
class PipeWireGraphCollector final : public DiagnosticCollector {
 public:
  static constexpr BoundedCommand::Limits kLimits{std::chrono::seconds(5), std::size_t{2} << 20};

  explicit PipeWireGraphCollector(std::vector<std::string> command = {"pw-dump"},
                                  const BoundedCommand::Limits& limits = kLimits)
      : command_(std::move(command)), limits_(limits) {}

  std::string_view fileName() const override { return "pipewire.json"; }
  [[nodiscard]] Result collect() override;

 private:
  const std::vector<std::string> command_;
  const BoundedCommand::Limits limits_;
};

}  // namespace tonewerk
