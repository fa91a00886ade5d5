// SPDX-License-Identifier: Apache-2.0
#include "session/KeySlots.h"

namespace tonewerk {

std::uint32_t KeySlots::lookUp(const Shape& shape) {
  const Shape::Origin& origin = shape.origin();
  if (table_ == 0) table_ = origin.table;
  // The numbers of another table mean other shapes.
  if (origin.table != table_ || table_ == 0) return kForeign;
  if (origin.number >= rows_.size()) rows_.resize(std::size_t{origin.number} + 1, kUnknown);
  const std::size_t begin = slots_.size();
  bool hasAny = false;
  for (const std::string_view key : keys_) {
    const std::size_t slot = shape.find(key);
    hasAny = hasAny || slot != Shape::kNoSlot;
    slots_.push_back(slot == Shape::kNoSlot ? kNoSlot : static_cast<std::uint32_t>(slot));
  }
  if (!hasAny) slots_.resize(begin);
  rows_[origin.number] = hasAny ? kFirstRow + static_cast<std::uint32_t>(begin / keys_.size()) : kNoKeys;
  return rows_[origin.number];
}

}  // namespace tonewerk
