// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlRun.h"

#include <algorithm>
#include <memory>
#include <ostream>
#include <string_view>
#include <vector>

#include "tools/twctl/input/Suggestion.h"
#include "tools/twctl/sql/StoreNames.h"
#include "values/ClosestName.h"
#include "values/PrintableText.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// How much of a long line is shown around the place of a problem, in bytes.
constexpr std::size_t kShownBefore = 40;
constexpr std::size_t kShownAfter = 30;

void writeRows(SqlQuery& query, RowWriter& writer, const std::ostream& out, SqlOutcome& outcome) {
  const std::vector<std::string> columns = query.columns();
  if (columns.empty()) return;
  writer.begin(columns);
  std::vector<SqlValue> row(columns.size());
  while (out.good() && query.next(outcome.problem)) {
    for (std::size_t at = 0; at < row.size(); ++at) row[at] = query.value(static_cast<int>(at));
    writer.add(row);
    ++outcome.rows;
  }
  writer.end();
}

// Adds to "no such table: sesion" and "no such column: aplication" which name was probably meant.
void addHint(SqlReader& reader, SqlProblem& problem) {
  static constexpr std::string_view kTable = "no such table: ";
  static constexpr std::string_view kColumn = "no such column: ";
  if (problem.kind != SqlProblem::Kind::kQuery) return;
  const bool isTable = problem.text.starts_with(kTable);
  if (!isTable && !problem.text.starts_with(kColumn)) return;
  std::vector<std::string> names = viewsOf(reader);
  for (std::string& table : tablesOf(reader)) names.push_back(std::move(table));
  if (!isTable) {
    std::vector<std::string> columns;
    for (const std::string& name : names) {
      for (StoreColumn& column : columnsOf(reader, name)) columns.push_back(std::move(column.name));
    }
    names = std::move(columns);
  }
  // SQLite repeats what the query says: "s.aplication".
  const std::size_t begin = (isTable ? kTable : kColumn).size();
  const std::size_t dot = problem.text.rfind('.');
  const std::string word = problem.text.substr(dot == std::string::npos || dot < begin ? begin : dot + 1);
  if (const auto meant = closestTo(word, names)) problem.text += "; " + didYouMean(*meant);
}

}  // namespace

SqlOutcome runSql(SqlReader& reader, const std::string& text, const RowFormat& format, std::ostream& out) {
  SqlOutcome outcome;
  std::size_t from = 0;
  while (out.good() && !outcome.problem) {
    const std::unique_ptr<SqlQuery> query = reader.prepare(text, from, outcome.problem);
    if (query == nullptr) break;
    const std::unique_ptr<RowWriter> writer = makeRowWriter(format, reader, out);
    if (++outcome.statements > 1 && format.kind == RowFormat::Kind::kTable) out << '\n';
    writeRows(*query, *writer, out, outcome);
  }
  if (outcome.problem) addHint(reader, *outcome.problem);
  return outcome;
}

std::string describe(const SqlProblem& problem, const std::string& text) {
  if (problem.kind != SqlProblem::Kind::kQuery) return printable(problem.text);
  // A statement that ends too early is wrong at its end, not in the spaces behind it.
  std::size_t place = std::min(problem.place, text.size());
  const std::size_t begin = place == 0 ? 0 : text.rfind('\n', place - 1) + 1;
  const std::size_t end = std::min(text.find('\n', place), text.size());
  const auto line = 1 + std::count(text.begin(), text.begin() + static_cast<std::ptrdiff_t>(place), '\n');
  const std::size_t column = 1 + utf8Characters(std::string_view(text).substr(begin, place - begin));

  std::size_t from = place - begin > kShownBefore ? place - kShownBefore : begin;
  while (from < place && isUtf8Continuation(text[from])) ++from;
  std::size_t to = std::min(end, place + kShownAfter);
  while (to < end && isUtf8Continuation(text[to])) ++to;
  const std::string before = printable(text.substr(from, place - from));
  return "line " + std::to_string(line) + ", column " + std::to_string(column) + ": " +
         printable(problem.text) + "\n  " + before + printable(text.substr(place, to - place)) + "\n  " +
         std::string(utf8Characters(before), ' ') + "^";
}

}  // namespace tonewerk
