// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <termios.h>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// A terminal for a program of a test: what the program writes is collected, and keys can be pressed. A
// program gets path() as its input and output.
class PseudoTerminal {
 public:
  PseudoTerminal();

  const std::string& path() const { return path_; }
  void resize(unsigned short columns, unsigned short rows) const;
  void press(std::string_view keys) const;

  // Whether the program writes this in time, behind what was waited for before.
  bool waitFor(const std::string& text);
  // All that has been written.
  const std::string& written();

  // How keys and lines are treated now.
  termios modes() const;

 private:
  void collect();

  FileDescriptor master_;
  FileDescriptor slave_;  // so that the terminal outlives its programs
  std::string path_;
  std::string written_;
  std::size_t seen_ = 0;  // of written_, by waitFor()
};

}  // namespace tonewerk
