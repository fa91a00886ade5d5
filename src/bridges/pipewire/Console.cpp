// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/Console.h"

namespace tonewerk {

void Console::say(std::string_view line) const {
  std::fprintf(out_, "tw-pipewire: %.*s\n", static_cast<int>(line.size()), line.data());
}

void Console::detail(std::string_view line) const {
  if (verbose_) say(line);
}

}  // namespace tonewerk
