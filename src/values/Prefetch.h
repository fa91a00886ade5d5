// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "values/PackedMap.h"
#include "values/ValueMap.h"

namespace tonewerk {

// Ask the processor to read memory into its caches, and do not wait for it. Memory that was written long ago
// comes hundreds of times more slowly than what is in the caches, so a walk over many messages asks for the
// next ones while it handles one.

inline void prefetch(const void* at) { __builtin_prefetch(at); }

inline void prefetchLines(const void* at, std::size_t bytes) {
  constexpr std::size_t kLine = 64;
  for (std::size_t line = 0; line < bytes; line += kLine) prefetch(static_cast<const char*>(at) + line);
}

// Only for a packed map, of which it reads the first `bytes`.
inline void prefetch(const ValueMap& map, std::size_t bytes) {
  if (map.packed() != nullptr) prefetchLines(map.packed(), bytes);
}

}  // namespace tonewerk
