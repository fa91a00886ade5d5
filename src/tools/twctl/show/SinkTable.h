// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>

#include "tools/twctl/show/Table.h"

namespace tonewerk {

class ValueMap;

// Prints for `twctl status` how the daemon's sinks stand, a row for each.
class SinkTable {
 public:
  explicit SinkTable(std::ostream& out);

  // See Table::fit().
  void fit(std::size_t width) { table_.fit(width); }

  // `sink` is one of the answer to watch.accounts.
  void add(const ValueMap& sink);

 private:
  Table table_;
};

}  // namespace tonewerk
