// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/pb/WireType.h"

namespace tonewerk::PB {

// Reads protocol-buffer fields one after the other. After an error it reads nothing more, and every later
// call fails.
class Reader {
 public:
  struct Key {
    std::uint32_t tag;
    WireType type;
  };

  virtual ~Reader() = default;

  // Returns none at the end of the input and on an error.
  [[nodiscard]] virtual std::optional<Key> nextKey() = 0;

  // Read the value that follows the last key. Each fails when the input ends within the value. A varint has
  // at most ten bytes.
  [[nodiscard]] virtual std::optional<std::uint64_t> readVarint() = 0;
  [[nodiscard]] virtual std::optional<std::string> readBytes() = 0;
  // Skips a value; a group is skipped up to its end.
  [[nodiscard]] virtual bool skip(const Key& key) = 0;

  virtual bool hasError() const = 0;
};

}  // namespace tonewerk::PB
