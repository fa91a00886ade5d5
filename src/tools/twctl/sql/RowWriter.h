// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// Writes the rows of a query, one after the other.
class RowWriter {
 public:
  virtual ~RowWriter() = default;

  // Once before the rows.
  virtual void begin(const std::vector<std::string>& columns) = 0;
  // `row` has a value for each column.
  virtual void add(const std::vector<SqlValue>& row) = 0;
  // Once after the rows.
  virtual void end() = 0;
};

// How rows are written:
//
//            table                     JSON lines          CSV (RFC 4180, with a header)
//   NULL     nothing                   null                nothing
//   number   shortest digits           the number          shortest digits
//   text     safe for a terminal       a JSON text         in quotes where needed, "" when empty
//   bytes    hexadecimal digits        the digits as text  the digits
//
// In JSON lines an object in one of the columns that hold JSON (payload, session_info, user_info) is written
// as JSON.
struct RowFormat {
  enum class Kind { kTable, kJson, kCsv };
  Kind kind = Kind::kTable;
  std::optional<std::size_t> width;  // of the terminal, for tables
  bool escapes = false;              // CSV, too, is safe for a terminal
};

// `reader` and `out` outlive the writer. Memory is bounded by a portion of the rows.
std::unique_ptr<RowWriter> makeRowWriter(const RowFormat& format, SqlReader& reader, std::ostream& out);

}  // namespace tonewerk
