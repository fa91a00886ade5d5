// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

class ValueMap;

// Stands for a map with 128 bits, for code that wants to know later whether another map equals it but must
// not keep the map. Equal maps have equal digests, whatever the order of their entries and the forms of their
// numbers.
//
// Different maps have different digests, except by accident. Both halves are keyed hashes whose keys are new
// in each process, so that nobody can search in advance for two maps with one digest: two maps of a megabyte
// collide with a probability below 2^-80. Digests of different processes cannot be compared, and a digest is
// not safe against somebody who sees digests. Computing one costs about two multiplications for each eight
// bytes.
struct ValueDigest {
  static ValueDigest of(const ValueMap& map);

  friend bool operator==(const ValueDigest&, const ValueDigest&) = default;

  std::uint64_t first = 0;
  std::uint64_t second = 0;
};

}  // namespace tonewerk
