// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <string>
#include <string_view>

#include "platform/CommandRunner.h"

namespace tonewerk {

// One of the two tools whose output makes a memory log.
class MemoryLogTool {
 public:
  // Which of a tool's lines are kept: those about wired and per-process memory, marked, or all as they are.
  enum class Filter { kMemoryLines, kNone };

  // A longer line counts as several.
  static constexpr std::size_t kMaxLineBytes = 2048;
  // What a tool may take; past it, it is ended, and what it said until then is kept.
  static constexpr CommandRunner::Limits kLimits{.bytes = std::size_t{4} << 20,
                                                 .time = std::chrono::seconds(30)};

  MemoryLogTool(std::string command, Filter filter) : command_(std::move(command)), filter_(filter) {}

  // Runs the tool and gives the lines that are kept; nothing when it could not be started. Blocks. Any
  // thread.
  [[nodiscard]] std::string capture(CommandRunner& commands) const;

  // Of a tool's whole output, what is kept.
  static std::string keptLines(std::string_view output, Filter filter);

 private:
  void logEnd(const CommandRunner::Result& result) const;

  const std::string command_;
  const Filter filter_;
};

}  // namespace tonewerk
