// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <string>

namespace tonewerk {

// Makes ULIDs: identifiers of 26 characters, unique anywhere, that sort in the order in which one generator
// made them. One thread.
class UlidGenerator {
 public:
  using Random = std::function<std::uint32_t()>;

  // The system's randomness.
  UlidGenerator();
  explicit UlidGenerator(Random random) : random_(std::move(random)) {}

  // `now` in seconds since 1970. Identifiers of one millisecond, and of a clock that went back, count up.
  std::string next(double now);

 private:
  static constexpr std::size_t kRandomBytes = 10;

  Random random_;
  std::uint64_t milliseconds_ = 0;
  std::array<std::uint8_t, kRandomBytes> tail_{};
};

}  // namespace tonewerk
