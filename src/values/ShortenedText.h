// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string_view>

#include "values/Utf8.h"

namespace tonewerk {

// The start of a UTF-8 text, at most `mostBytes` long and cut between two characters.
inline std::string_view shortened(std::string_view text, std::size_t mostBytes) {
  if (text.size() <= mostBytes) return text;
  std::size_t end = mostBytes;
  while (end > 0 && isUtf8Continuation(text[end])) --end;
  return text.substr(0, end);
}

}  // namespace tonewerk
