// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

namespace tonewerk {

// The text as one word of a shell's command line: in single quotes where it has characters that shells read,
// such as spaces.
inline std::string shellWord(std::string_view text) {
  constexpr std::string_view kPlain =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789_-+=:,./@%";
  if (!text.empty() && text.find_first_not_of(kPlain) == std::string_view::npos) return std::string(text);
  std::string word = "'";
  for (const char letter : text) {
    // The quotes end, an escaped one follows, and they begin again.
    if (letter == '\'') word += R"('\')";
    word += letter;
  }
  return word + "'";
}

}  // namespace tonewerk
