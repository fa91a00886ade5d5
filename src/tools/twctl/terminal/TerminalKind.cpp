// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/terminal/TerminalKind.h"

// In a source of its own, because term.h has macros with names such as "columns". It needs curses.h before
// it.
#include <cstdint>
#include <curses.h>
//
#include <term.h>

namespace tonewerk {

bool canShowPages(const char* type, int descriptor) {
  int result = 0;
  if (*type == '\0' || ::setupterm(type, descriptor, &result) != OK) return false;
  const char* place = ::tigetstr("cup");
  const bool canPlace = place != nullptr && reinterpret_cast<std::intptr_t>(place) != -1;
  ::del_curterm(::cur_term);
  return canPlace;
}

}  // namespace tonewerk
