// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <variant>

namespace tonewerk {

// What the operating system knows of processes. Any thread.
class ProcessInformation {
 public:
  virtual ~ProcessInformation() = default;

  // The process's short name (at most 15 bytes); none when there is no such process.
  virtual std::optional<std::string> processName(std::int32_t processIdentifier) const = 0;

  // This process.
  virtual std::int32_t ownProcessIdentifier() const = 0;

  // Memory that this process keeps from others, in bytes: resident and swapped anonymous memory. On failure
  // the operating system's text of why.
  [[nodiscard]] virtual std::variant<std::uint64_t, std::string> physicalFootprint() const = 0;

  // Processor time of this process so far, in microseconds (the ticks of the C library's processor clock).
  virtual std::int64_t processorTimeMicroseconds() const = 0;
};

}  // namespace tonewerk
