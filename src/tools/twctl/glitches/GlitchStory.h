// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>
#include <vector>

#include "tools/twctl/glitches/GlitchPicture.h"
#include "tools/twctl/glitches/StoredGlitches.h"
#include "values/Value.h"

namespace tonewerk {

// Why there was a glitch: its cycles as a picture, then the verdict and what to do, in words. All that it
// prints is safe for a terminal.
class GlitchStory {
 public:
  // `glitch` has a verdict. It outlives the object.
  GlitchStory(const GlitchInSessions& glitch, std::vector<GlitchCycle> cycles)
      : glitch_(glitch), cycles_(std::move(cycles)) {}

  // Words go on in the next line after `width` characters; none for any length.
  void print(std::ostream& out, GlitchPicture::Look look, std::optional<std::size_t> width) const;

  // The same for programs.
  ValueMap object() const;

 private:
  const GlitchInSessions& glitch_;
  const std::vector<GlitchCycle> cycles_;
};

}  // namespace tonewerk
