// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <variant>

namespace tonewerk {

// Gives what the operating system knows of processes. Any thread.
class ProcessInformation {
 public:
  virtual ~ProcessInformation() = default;

  // Returns the process's short name (at most 15 bytes); none when there is no such process.
  virtual std::optional<std::string> processName(std::int32_t processIdentifier) const = 0;

  // Returns the identifier of this process.
  virtual std::int32_t ownProcessIdentifier() const = 0;

  // Returns the memory that only this process uses, in bytes: resident and swapped anonymous memory. It
  // may be 10 ms old. On failure returns the operating system's error text.
  [[nodiscard]] virtual std::variant<std::uint64_t, std::string> physicalFootprint() const = 0;

  // Returns the processor time of this process so far, in microseconds (the ticks of the C library's
  // processor clock).
  virtual std::int64_t processorTimeMicroseconds() const = 0;
};

}  // namespace tonewerk
