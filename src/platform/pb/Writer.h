// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>

namespace tonewerk::PB {

// Writes protocol-buffer fields one after the other.
class Writer {
 public:
  virtual ~Writer() = default;

  virtual void writeVarint(std::uint32_t tag, std::uint64_t value) = 0;
  virtual void writeBytes(std::uint32_t tag, std::string_view value) = 0;
};

}  // namespace tonewerk::PB
