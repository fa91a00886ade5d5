// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace tonewerk {

struct TerminalSize {
  std::size_t columns = 80;
  std::size_t rows = 24;
};

// None when the descriptor is no terminal, or does not know its size.
std::optional<TerminalSize> terminalSizeOf(int descriptor);

// Shows one page at a time on the terminal's alternate screen. The destructor restores the previous screen.
// Keys arrive as they are pressed, also Ctrl-C, and are not echoed.
class Terminal {
 public:
  // `out` writes to the terminal `outDescriptor`. `inDescriptor` delivers keys, if it is a terminal, too.
  Terminal(std::ostream& out, int inDescriptor, int outDescriptor);
  Terminal(const Terminal&) = delete;
  Terminal& operator=(const Terminal&) = delete;
  // Restores the screen and the input's modes.
  ~Terminal();

  TerminalSize size() const;
  // Replaces the page by these lines.
  void show(const std::vector<std::string>& lines);

 private:
  struct InputModes;

  std::ostream& out_;
  const int inDescriptor_;
  const int outDescriptor_;
  const std::unique_ptr<InputModes> before_;  // null when the input is not a terminal
};

}  // namespace tonewerk
