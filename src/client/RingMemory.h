// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <span>

namespace tonewerk {

// The memory of a ring. All of it is touched when it is made, so that a real-time thread has no page faults
// there.
class RingMemory {
 public:
  // From this size on the memory is in huge pages, where the system permits that. With small pages, a thread
  // that writes through a large ring would wait for an address translation every few messages. Such memory is
  // mapped for the ring alone, so that the advice to the kernel does not concern the program's other memory.
  static constexpr std::size_t kHugePageBytes = std::size_t{2} * 1024 * 1024;

  // `size` is a power of two.
  explicit RingMemory(std::size_t size);

  std::span<unsigned char> bytes() const { return {bytes_.get(), bytes_.get_deleter().size}; }

 private:
  struct Free {
    std::size_t size;
    void operator()(unsigned char* bytes) const;
  };

  std::unique_ptr<unsigned char[], Free> bytes_;
};

}  // namespace tonewerk
