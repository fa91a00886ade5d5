// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>
#include <string>

namespace tonewerk {

// Prints lines of a label and a text, such as "store   12.3 MiB". A text that is too long goes on below
// itself, broken at spaces; several spaces count as one. Escapes what could control the terminal.
class WrappedLines {
 public:
  // Texts begin two columns after the widest label. Lines have at most `width` characters, but for words that
  // are longer; none for no limit.
  WrappedLines(std::ostream& out, std::size_t labelWidth, std::optional<std::size_t> width)
      : out_(out), labelWidth_(labelWidth), width_(width) {}

  void add(const std::string& label, const std::string& text);

 private:
  std::ostream& out_;
  const std::size_t labelWidth_;
  const std::optional<std::size_t> width_;
};

}  // namespace tonewerk
