// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>
#include <vector>

namespace tonewerk {

// The position of a number in a JSON text: its first character and the one after its last.
struct JsonNumber {
  std::uint32_t begin;
  std::uint32_t end;

  friend bool operator==(const JsonNumber&, const JsonNumber&) = default;
};

// Returns the positions of all numbers, in order. The JSON library's parser, which tells no positions, must
// have accepted `text`. That parser ends at a zero byte, and so does this function. `text` is smaller than
// 4 GiB.
[[nodiscard]] std::vector<JsonNumber> numbersInJson(std::string_view text);

// Returns the number at the beginning of `text`, by the grammar of JSON and as long as possible; empty if
// there is none.
[[nodiscard]] std::string_view leadingJsonNumber(std::string_view text);

}  // namespace tonewerk
