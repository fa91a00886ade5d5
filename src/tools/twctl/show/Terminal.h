// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>

namespace tonewerk {

struct TerminalSize {
  std::size_t columns = 80;
  std::size_t rows = 24;
};

// None when the descriptor is no terminal, or does not know its size.
std::optional<TerminalSize> terminalSizeOf(int descriptor);

}  // namespace tonewerk
