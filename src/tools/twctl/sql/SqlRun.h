// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>

#include "tools/twctl/sql/RowWriter.h"
#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

struct SqlOutcome {
  std::uint64_t statements = 0;
  std::uint64_t rows = 0;  // of all statements
  std::optional<SqlProblem> problem;
};

// Runs the statements of `text` one after the other, up to the first failure, and writes their rows as they
// come. Tables are separated by an empty line. Ends early when `out` fails.
SqlOutcome runSql(SqlReader& reader, const std::string& text, const RowFormat& format, std::ostream& out);

// Describes a problem with `text`: for a wrong query "line 1, column 10: near "FORM": syntax error", and in
// two more lines the line of the query and a mark below the place.
std::string describe(const SqlProblem& problem, const std::string& text);

}  // namespace tonewerk
