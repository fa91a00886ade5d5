// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/Terminal.h"

#include <sys/ioctl.h>

#include "tools/twctl/Tool.h"

namespace tonewerk {

std::optional<TerminalSize> terminalSizeOf(int descriptor) {
  winsize size{};
  if (::ioctl(descriptor, TIOCGWINSZ, &size) != 0 || size.ws_col == 0 || size.ws_row == 0)
    return std::nullopt;
  return TerminalSize{size.ws_col, size.ws_row};
}

std::optional<std::size_t> widthOf(const Tool& tool) {
  const auto size = tool.outIsTerminal ? terminalSizeOf(tool.outDescriptor) : std::nullopt;
  return size ? std::optional(size->columns) : std::nullopt;
}

}  // namespace tonewerk
