// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string_view>
#include <vector>

#include "values/SharedString.h"

namespace tonewerk {

// Caches recent texts, so that a repeated text needs neither an allocation nor another UTF-8 check. A
// client's messages repeat the same few dozen keys during its whole life.
//
// Each text belongs to one slot, chosen by its hash, and a newer text replaces an older one there. That
// limits memory to slots * maxBytes. A client that always sends new texts makes the cache useless but no
// larger. One thread.
class StringInterner {
 public:
  // `slots` is a power of two. Texts longer than `maxBytes` are never cached.
  StringInterner(std::size_t slots, std::size_t maxBytes) : slots_(slots), maxBytes_(maxBytes) {}

  // The text, shared with its earlier users where possible. None when isText() refuses it.
  [[nodiscard]] std::optional<SharedString> find(std::string_view text);

 private:
  struct Slot {
    SharedString text;
    std::size_t next = 0;  // the slot of the text that followed this one last time
  };

  std::vector<Slot> slots_;
  std::size_t maxBytes_;
  std::size_t last_ = 0;  // the slot of the text that was found last
};

}  // namespace tonewerk
