// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <string_view>

#include "platform/CommandRunner.h"

namespace tonewerk {

// Runs one of the two tools whose output makes a memory log.
class MemoryLogTool {
 public:
  // Which of the tool's lines are kept. kMemoryLines keeps those about wired and per-process memory and puts
  // a prefix before each; kNone keeps all lines unchanged.
  enum class Filter { kMemoryLines, kNone };

  // A longer line is treated as several lines.
  static constexpr std::size_t kMaxLineBytes = 2048;
  // A tool that exceeds them is stopped; its output up to then is kept.
  static constexpr CommandRunner::Limits kLimits{.bytes = std::size_t{4} << 20,
                                                 .time = std::chrono::seconds(30)};

  MemoryLogTool(std::string command, Filter filter) : command_(std::move(command)), filter_(filter) {}

  // Runs the tool and returns the lines that are kept, or an empty text when the tool could not be started.
  // Waits for the tool. Any thread may call it.
  [[nodiscard]] std::string capture(CommandRunner& commands) const;

  // Returns what is kept of a tool's whole output.
  static std::string keptLines(std::string_view output, Filter filter);

 private:
  void logEnd(const CommandRunner::Result& result) const;

  const std::string command_;
  const Filter filter_;
};

}  // namespace tonewerk
