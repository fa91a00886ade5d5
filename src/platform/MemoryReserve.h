// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// Memory that is put aside at the start of the process for the moment when the system gives no more.
//
//   an allocation fails -> the reserve is given back, isShort() -> the allocation succeeds
//                       -> without a reserve: std::bad_alloc, which ends the process
//
// While memory is short, requests that would hold more of it are refused. What is under way goes on with the
// memory of the reserve. All functions may be called on any thread; they are the process's, like operator
// new itself.
class MemoryReserve {
 public:
  static constexpr std::size_t kBytes = std::size_t{32} << 20;

  // From now on there is a reserve. False when there is no memory even now.
  [[nodiscard]] static bool putAside();

  // Whether the reserve is in use. Costs one load.
  static bool isShort();

  // Puts the reserve aside again when there is memory for twice as much. True when memory is not short now.
  static bool tryToRecover();

  // What is put aside now: allocated, but never written to, so that it takes no RAM.
  static std::size_t unusedBytes();

  // Gives the reserve back, as a failed allocation does. False when there is none.
  static bool use();
};

}  // namespace tonewerk
