// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

class ValueMap;

// 128 bits that stand for a map, for whoever wants to know later whether another one equals it and must not
// keep it. Equal maps, as values compare, have equal digests whatever their order and their numbers' forms.
//
// Others have different ones but for an accident. Both halves are keyed hashes whose keys are drawn anew for
// each process, so that nobody can look for two maps of one digest beforehand: two maps of a megabyte meet
// with a chance below 2^-80. Not for comparing across processes, and no proof against somebody who sees
// digests. Costs about two multiplications for each eight bytes.
struct ValueDigest {
  static ValueDigest of(const ValueMap& map);

  friend bool operator==(const ValueDigest&, const ValueDigest&) = default;

  std::uint64_t first = 0;
  std::uint64_t second = 0;
};

}  // namespace tonewerk
