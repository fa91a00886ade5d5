// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

namespace tonewerk {

struct Tool;

// While it exists, what a command prints to a terminal is collected, and goes through a pager as soon as it
// is longer than the screen:
//
//   short   output, then errors                     nothing else is started
//   long    pager  <--  output as it comes          errors when the pager has ended
//
// The pager is the variable TONEWERK_PAGER, else PAGER, else less; words of it may be quoted, and no shell
// reads them. Empty and "cat" mean none. Output is printed as it is where it is not for a terminal or the
// terminal is "dumb", with --json and --no-pager, and where there is no such pager.
//
// When the reader leaves the pager early, the output fails, so that the command can end; that is no error.
// One object at a time, for commands that end by themselves.
class PagedOutput {
 public:
  // `tool` outlives it.
  explicit PagedOutput(const Tool& tool);
  PagedOutput(const PagedOutput&) = delete;
  PagedOutput& operator=(const PagedOutput&) = delete;
  // Prints what is left, and waits for the end of the pager.
  ~PagedOutput();

 private:
  class Pages;

  std::unique_ptr<Pages> pages_;  // null when nothing is collected
};

}  // namespace tonewerk
