// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <string>

namespace tonewerk {

// Makes ULIDs: globally unique identifiers of 26 characters. The identifiers of one generator sort in the
// order in which it made them. Not thread-safe.
class UlidGenerator {
 public:
  using Random = std::function<std::uint32_t()>;

  // Uses the system's random numbers.
  UlidGenerator();
  explicit UlidGenerator(Random random) : random_(std::move(random)) {}

  // `now` is in seconds since 1970. Within one millisecond, and if the clock goes back, the random part
  // counts up.
  std::string next(double now);

 private:
  static constexpr std::size_t kRandomBytes = 10;

  Random random_;
  std::uint64_t milliseconds_ = 0;
  std::array<std::uint8_t, kRandomBytes> tail_{};
};

}  // namespace tonewerk
