// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "tools/twctl/sessions/GlitchCycles.h"

namespace tonewerk {

// Draws the cycles around a glitch as text: a line for each node of a cycle, on one scale of time, so that
// one sees who came when, how long it took, and who went beyond the end of the period.
//
//   the glitch's cycle, of 5.33 ms
//     studio        ████████████|▓▓▓▓▓▓  8.4 ms
//     player                    |      ░ not woken
class GlitchPicture {
 public:
  struct Look {
    std::size_t width = 80;  // of a line, at least kNarrowest
    bool isUnicode = false;  // else only ASCII
    bool isColoured = false;
  };
  static constexpr std::size_t kNarrowest = 40;
  static constexpr std::size_t kMostAround = 2;  // cycles before the glitch's own, and as many after it

  explicit GlitchPicture(Look look) : look_(look) {}

  // Lines that each end with a line feed, safe for a terminal. Empty without cycles.
  std::string draw(const std::vector<GlitchCycle>& cycles) const;
  // What the signs mean, in a line.
  std::string legend() const;

 private:
  struct Scale;
  void drawNode(std::string& text, const GlitchCycle& cycle, const GlitchCycle::Node& node,
                const Scale& scale) const;

  const Look look_;
};

}  // namespace tonewerk
