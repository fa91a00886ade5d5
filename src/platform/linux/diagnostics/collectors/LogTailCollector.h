// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <utility>

#include "platform/linux/diagnostics/collectors/DiagnosticCollector.h"
#include "platform/linux/log/RecentLines.h"

namespace tonewerk {

// Collects the last lines of the daemon's log.
class LogTailCollector final : public DiagnosticCollector {
 public:
  explicit LogTailCollector(std::shared_ptr<const RecentLines> lines) : lines_(std::move(lines)) {}

  std::string_view fileName() const override { return "log.txt"; }
  [[nodiscard]] Result collect() override { return {lines_->text(), ""}; }

 private:
  const std::shared_ptr<const RecentLines> lines_;
};

}  // namespace tonewerk
