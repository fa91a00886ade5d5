// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlPrompt.h"

#include <ostream>
#include <string_view>
#include <vector>

#include "tools/twctl/input/Suggestion.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/Table.h"
#include "tools/twctl/sql/SqlCompletion.h"
#include "tools/twctl/sql/StoreNames.h"
#include "values/Date.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr std::string_view kSpaces = " \t\r\n";

constexpr std::string_view kHelp =
    "SELECT ...;     runs a query; it may have several lines, and ends with ; or an empty line\n"
    ".tables         the views and tables, with their columns\n"
    ".schema VIEW    the columns of a view or table, and the SQL that made it\n"
    ".help           this text\n"
    ".quit           ends, as Ctrl-D does\n"
    "\n"
    "Tab completes names, Ctrl-C drops a line or stops a query. Times are seconds since 1970:\n"
    "  SELECT datetime(at, 'unixepoch', 'localtime') ... WHERE at > unixepoch('now', '-7 days')\n";

std::string trimmed(std::string_view text) {
  const std::size_t begin = text.find_first_not_of(kSpaces);
  if (begin == std::string_view::npos) return "";
  return std::string(text.substr(begin, text.find_last_not_of(kSpaces) - begin + 1));
}

std::string joined(const std::vector<StoreColumn>& columns) {
  std::string text;
  for (const StoreColumn& column : columns) text += (text.empty() ? "" : ", ") + column.name;
  return text;
}

}  // namespace

void SqlPrompt::run(const Format& format, const Run& runStatement) {
  greet();
  std::string statement;
  while (tool_.out.flush()) {
    const LineReader::Line line = lines_.read(statement.empty() ? "sql> " : "...> ");
    if (line.kind == LineReader::Line::Kind::kEnd) {
      tool_.out << '\n';
      return;
    }
    const std::string text = trimmed(line.text);
    if (line.kind == LineReader::Line::Kind::kCancelled) {
      statement.clear();
      continue;
    }
    if (statement.empty() && text.empty()) continue;
    const bool isCommand = text.starts_with('.') || text == "quit" || text == "exit" || text == "help";
    if (statement.empty() && isCommand) {
      if (!runCommand(text, format())) return;
      continue;
    }
    statement += line.text + "\n";
    if (!text.empty() && !isWholeStatement(statement)) continue;
    runStatement(statement, format());
    statement.clear();
  }
}

void SqlPrompt::greet() const {
  const std::optional<StoreSpan> span = spanOf(reader_);
  tool_.out << printable(path_) << ", "
            << (span ? "from " + localTime(span->from) + " to " + localTime(span->until)
                     : std::string("nothing recorded yet"))
            << "\nOnly reading is possible. .help explains, .tables lists the views, .quit ends.\n";
}

bool SqlPrompt::runCommand(const std::string& line, const RowFormat& format) {
  const std::string word = line.substr(0, line.find_first_of(kSpaces));
  const std::string argument = trimmed(line.substr(word.size()));
  if (word == ".quit" || word == ".exit" || word == "quit" || word == "exit") return false;
  if (word == ".help" || word == "help") {
    tool_.out << kHelp;
  } else if (word == ".tables") {
    showTables(format);
  } else if (word == ".schema" && !argument.empty()) {
    showSchema(argument, format);
  } else if (word == ".schema") {
    complain(".schema needs the name of a view or table; " + thereAre(readableNamesOf(reader_)));
  } else {
    complain("there is no " + word + "; " + hintFor(word, promptCommands()));
  }
  return true;
}

void SqlPrompt::showTables(const RowFormat& format) {
  const auto show = [&](const char* heading, const std::vector<std::string>& names) {
    Table table(tool_.out, format.kind == RowFormat::Kind::kJson, {heading, "columns"});
    if (format.width) table.fit(*format.width);
    for (const std::string& name : names) table.add({Value(name), Value(joined(columnsOf(reader_, name)))});
  };
  const std::vector<std::string> views = viewsOf(reader_);
  show("view", views);
  if (!views.empty() && format.kind != RowFormat::Kind::kJson) tool_.out << '\n';
  show("table", tablesOf(reader_));
}

void SqlPrompt::showSchema(const std::string& argument, const RowFormat& format) {
  const std::string wanted = trimmed(argument.substr(0, argument.find(';')));
  const std::optional<std::string> name = nameInStore(reader_, wanted);
  if (!name) {
    std::vector<std::string> names = viewsOf(reader_);
    for (const std::string& table : tablesOf(reader_)) names.push_back(table);
    complain("there is no view or table '" + wanted + "'; " + hintFor(wanted, names));
    return;
  }
  {
    Table table(tool_.out, format.kind == RowFormat::Kind::kJson, {"column", "type"});
    for (const StoreColumn& column : columnsOf(reader_, *name))
      table.add({Value(column.name), Value(column.type)});
  }
  if (format.kind != RowFormat::Kind::kJson)
    tool_.out << '\n' << printableLines(definitionOf(reader_, *name)) << ";\n";
}

void SqlPrompt::complain(const std::string& problem) const { (void)tool_.fail(kWrongUsage, problem); }

}  // namespace tonewerk
