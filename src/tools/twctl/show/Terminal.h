// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <memory>
#include <string>
#include <vector>

namespace tonewerk {

struct TerminalSize {
  std::size_t columns = 80;
  std::size_t rows = 24;
};

// A terminal that shows one page at a time, on the screen that it keeps for such programs; what was there
// before is there again afterwards. Keys come as they are pressed, Ctrl-C included, and are not shown.
class Terminal {
 public:
  // `out` writes to the terminal `outDescriptor`; keys come from `inDescriptor`, if that is one too.
  Terminal(std::ostream& out, int inDescriptor, int outDescriptor);
  Terminal(const Terminal&) = delete;
  Terminal& operator=(const Terminal&) = delete;
  // Everything is as it was.
  ~Terminal();

  TerminalSize size() const;
  // In place of what is there.
  void show(const std::vector<std::string>& lines);

 private:
  struct InputModes;

  std::ostream& out_;
  const int inDescriptor_;
  const int outDescriptor_;
  const std::unique_ptr<InputModes> before_;  // null when the input is no terminal
};

}  // namespace tonewerk
