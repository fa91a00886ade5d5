// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <string>

#include "tools/twctl/show/Table.h"

namespace tonewerk {

class ValueMap;

// Prints the users' accounts for `twctl status`: a row for each resource that a user holds or was refused.
class AccountTable {
 public:
  explicit AccountTable(std::ostream& out);

  // See Table::fit().
  void fit(std::size_t width) { table_.fit(width); }

  // `account` is one of the answer to watch.accounts.
  void add(const ValueMap& account);

 private:
  void addRow(const ValueMap& account, const std::string& resource, const Table::Cell& held,
              const Table::Cell& share, std::uint64_t refused);

  Table table_;
};

}  // namespace tonewerk
