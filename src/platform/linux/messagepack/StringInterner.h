// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string_view>
#include <vector>

#include "values/SharedString.h"

namespace tonewerk {

// Texts that were seen lately, so that one that comes again costs neither an allocation nor another UTF-8
// check. A client's messages repeat the same few dozen keys for as long as it lives.
//
// Each text has one place, by its hash; a newer one takes it over. Memory is so bounded by slots * mostBytes,
// and a client that sends ever new texts only makes the cache useless. One thread.
class StringInterner {
 public:
  // `slots` a power of two. Texts longer than `mostBytes` are never kept.
  StringInterner(std::size_t slots, std::size_t mostBytes) : slots_(slots), mostBytes_(mostBytes) {}

  // The text, shared with its earlier users where possible. None when isText() says that it is none.
  [[nodiscard]] std::optional<SharedString> find(std::string_view text);

 private:
  struct Slot {
    SharedString text;
    std::size_t next = 0;
  };

  std::vector<Slot> slots_;
  std::size_t mostBytes_;
  std::size_t last_ = 0;  // the place of the text that was asked for last
};

}  // namespace tonewerk
