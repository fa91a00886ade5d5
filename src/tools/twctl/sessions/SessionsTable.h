// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>

#include "tools/twctl/sessions/StoredSessions.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {

// Prints sessions of the store: for people in columns, of which the less important ones go where the terminal
// is narrow; for programs with the names of the view `session`.
class SessionsTable {
 public:
  // `now` in seconds since 1970: until then sessions run that have not ended. `width`: that of the terminal;
  // none for any.
  SessionsTable(std::ostream& out, bool asJson, double now, std::optional<std::size_t> width);

  void add(const StoredSession& session);

 private:
  const bool asJson_;
  const double now_;
  Table table_;
};

}  // namespace tonewerk
