// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <optional>
#include <string_view>
#include <system_error>

namespace tonewerk {

// Finds values in lines of the form "Name:   value ...", which the kernel's status and meminfo files have.
class KeyValueLines {
 public:
  // `text` must outlive this object and the results of find().
  explicit KeyValueLines(std::string_view text) : text_(text) {}

  // The text after the name and the white space, up to the end of the line. If several lines have the name,
  // the first one counts. None if no line has it; not every kernel writes every line.
  [[nodiscard]] std::optional<std::string_view> find(std::string_view name) const {
    for (std::string_view rest = text_; !rest.empty();) {
      std::string_view line = rest.substr(0, rest.find('\n'));
      rest.remove_prefix(std::min(line.size() + 1, rest.size()));
      if (!line.starts_with(name) || !line.substr(name.size()).starts_with(':')) continue;
      line.remove_prefix(name.size() + 1);
      line.remove_prefix(std::min(line.find_first_not_of(" \t"), line.size()));
      return line;
    }
    return std::nullopt;
  }

  // The number at the beginning of the line's value; none if there is no such line or number.
  [[nodiscard]] std::optional<std::uint64_t> number(std::string_view name) const {
    const std::string_view value = find(name).value_or(std::string_view());
    std::uint64_t number = 0;
    const auto parsed = std::from_chars(value.data(), value.data() + value.size(), number);
    if (parsed.ec != std::errc()) return std::nullopt;
    return number;
  }

 private:
  const std::string_view text_;
};

}  // namespace tonewerk
