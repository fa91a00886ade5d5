// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <charconv>
#include <cstddef>
#include <optional>
#include <string_view>
#include <system_error>
#include <vector>

namespace tonewerk {

// Splits a text at white space.
inline std::vector<std::string_view> splitWhitespace(std::string_view text) {
  constexpr std::string_view kWhiteSpace = " \t\n";
  std::vector<std::string_view> words;
  for (;;) {
    const std::size_t start = text.find_first_not_of(kWhiteSpace);
    if (start == std::string_view::npos) return words;
    text.remove_prefix(start);
    words.push_back(text.substr(0, text.find_first_of(kWhiteSpace)));
    text.remove_prefix(words.back().size());
  }
}

// Parses a word as a number; 0 if the whole word is not a number.
template <typename Number>
Number numberIn(std::string_view word) {
  Number number{};
  const auto parsed = std::from_chars(word.data(), word.data() + word.size(), number);
  return parsed.ec == std::errc() && parsed.ptr == word.data() + word.size() ? number : Number{};
}

// The parts of the text in /proc/PID/stat: "PID (name) S 1 ...".
struct ProcessStat {
  // Indices in `fields`.
  static constexpr std::size_t kState = 0;
  static constexpr std::size_t kParent = 1;
  static constexpr std::size_t kUserTicks = 11;
  static constexpr std::size_t kSystemTicks = 12;
  static constexpr std::size_t kThreads = 17;
  static constexpr std::size_t kFields = 18;  // the number of fields up to the last index

  std::string_view name;                 // may hold any characters, including closing brackets
  std::vector<std::string_view> fields;  // after the name; at least kFields

  // The result refers to `text`. None if the text has another form or fewer than kFields fields.
  [[nodiscard]] static std::optional<ProcessStat> parse(std::string_view text) {
    const std::size_t opening = text.find('(');
    const std::size_t closing = text.rfind(')');
    if (opening == std::string_view::npos || closing == std::string_view::npos || closing < opening) {
      return std::nullopt;
    }
    ProcessStat stat{text.substr(opening + 1, closing - opening - 1),
                     splitWhitespace(text.substr(closing + 1))};
    if (stat.fields.size() < kFields) return std::nullopt;
    return stat;
  }
};

}  // namespace tonewerk
