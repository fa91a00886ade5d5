// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>

#include "tools/twctl/glitches/StoredGlitches.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {

// Prints glitches: for people in columns, of which the less important ones go where the terminal is narrow;
// for programs with the names of the view `glitch`.
class GlitchesTable {
 public:
  // `width`: that of the terminal; none for any.
  GlitchesTable(std::ostream& out, bool asJson, std::optional<std::size_t> width);

  void add(const StoredGlitch& glitch);

 private:
  const bool asJson_;
  Table table_;
};

// Prints who caused how many, in the same way. `keyName`: the heading of the keys.
class GlitchSumsTable {
 public:
  GlitchSumsTable(std::ostream& out, bool asJson, const std::string& keyName,
                  std::optional<std::size_t> width);

  void add(const GlitchSum& sum);

 private:
  const bool asJson_;
  Table table_;
};

}  // namespace tonewerk
