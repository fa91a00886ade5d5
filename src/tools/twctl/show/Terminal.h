// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>

namespace tonewerk {

struct Tool;

struct TerminalSize {
  std::size_t columns = 80;
  std::size_t rows = 24;
};

// None when the descriptor is no terminal, or does not know its size.
std::optional<TerminalSize> terminalSizeOf(int descriptor);

// How wide lines for people may be: the columns of the terminal that the tool prints to. None for any width.
std::optional<std::size_t> widthOf(const Tool& tool);

}  // namespace tonewerk
