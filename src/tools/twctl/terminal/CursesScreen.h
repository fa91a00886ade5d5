// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <vector>

#include "tools/twctl/show/Terminal.h"
#include "tools/twctl/show/TopView.h"

namespace tonewerk {

// Shows one page at a time on a terminal, and reads its keys, Ctrl-C among them; the terminal does not echo
// them. Only what changes is written. There may be one object at a time, used on one thread.
//
// Changes the process's locale for characters (LC_CTYPE) to that of the environment, or to C.UTF-8 when that
// has no UTF-8.
class CursesScreen {
 public:
  // The terminal `outDescriptor` shows; `inDescriptor` delivers keys, -1 for none. Nothing is written before
  // the first page. Null when the variable TERM does not name a terminal on which a page can be shown.
  static std::unique_ptr<CursesScreen> open(int inDescriptor, int outDescriptor);
  CursesScreen(const CursesScreen&) = delete;
  CursesScreen& operator=(const CursesScreen&) = delete;
  // Restores the screen and the terminal's modes.
  ~CursesScreen();

  TerminalSize size() const;
  // Takes over the terminal's new size.
  void resize();
  // Replaces the page. Lines that are too long are cut.
  void show(const std::vector<TopLine>& lines);
  // A key that was pressed; none when there is none (any more), or for keys without a meaning.
  [[nodiscard]] std::optional<char32_t> takeKey();

 private:
  struct State;
  explicit CursesScreen(std::unique_ptr<State> state);

  const std::unique_ptr<State> state_;
};

}  // namespace tonewerk
