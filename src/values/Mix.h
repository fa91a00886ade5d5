// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <random>

namespace tonewerk {

// Multiplies to 128 bits and combines both halves, so that every bit of both factors affects every bit of the
// result.
inline std::uint64_t mix(std::uint64_t a, std::uint64_t b) {
  __extension__ using Product = unsigned __int128;
  const Product product = static_cast<Product>(a) * b;
  return static_cast<std::uint64_t>(product) ^ static_cast<std::uint64_t>(product >> 64);
}

// Returns a random key that is not known outside this process.
inline std::uint64_t randomKey() {
  std::random_device device;
  return (static_cast<std::uint64_t>(device()) << 32) | device();
}

}  // namespace tonewerk
