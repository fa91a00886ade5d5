// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <termios.h>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Provides a terminal for a program of a test: collects the program's output and presses keys. The program
// gets path() as its input and output.
class PseudoTerminal {
 public:
  PseudoTerminal();

  const std::string& path() const { return path_; }
  void resize(unsigned short columns, unsigned short rows) const;
  void press(std::string_view keys) const;

  // Whether the program writes this text in time, after the text of the previous call.
  bool waitFor(const std::string& text);
  // All output so far.
  const std::string& written();

  // The terminal's present modes.
  termios modes() const;

 private:
  void collect();

  FileDescriptor master_;
  FileDescriptor slave_;  // kept open so that the terminal outlives its programs
  std::string path_;
  std::string written_;
  std::size_t seen_ = 0;  // bytes of written_ that waitFor() has passed
};

}  // namespace tonewerk
