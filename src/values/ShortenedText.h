// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string_view>

#include "values/Utf8.h"

namespace tonewerk {

// Returns the start of a UTF-8 text: at most `maxBytes` bytes, cut between two characters.
inline std::string_view shortened(std::string_view text, std::size_t maxBytes) {
  if (text.size() <= maxBytes) return text;
  std::size_t end = maxBytes;
  while (end > 0 && isUtf8Continuation(text[end])) --end;
  return text.substr(0, end);
}

}  // namespace tonewerk
