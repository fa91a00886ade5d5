// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <optional>
#include <string_view>
#include <system_error>

namespace tonewerk {

// Lines of the form "Name:   value ...", as the kernel's status and meminfo files are.
class KeyValueLines {
 public:
  // `text` outlives this and what find() gives.
  explicit KeyValueLines(std::string_view text) : text_(text) {}

  // What comes behind the name and white space, up to the line's end; none without such a line: not every
  // kernel has every line. The first of several.
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

  // The number that the line's value begins with; none without one.
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
