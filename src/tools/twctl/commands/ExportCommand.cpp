// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <system_error>
#include <vector>

#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/LiveEvents.h"
#include "tools/twctl/commands/OutputFile.h"
#include "tools/twctl/commands/StoreSql.h"
#include "tools/twctl/input/Suggestion.h"
#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/show/Table.h"
#include "tools/twctl/sql/SqlRun.h"
#include "tools/twctl/sql/StoreNames.h"
#include "values/ClosestName.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

struct ExportOptions {
  std::string view;
  std::string format;
  std::optional<std::string> file;
  TimeRangeOptions range;
};

std::string problemWithFormat(const std::string& text) {
  return text == "csv" || text == "jsonl" ? ""
                                          : "'" + text + "' is no format; " + hintFor(text, {"csv", "jsonl"});
}

// "unknown view 'sesion'; did you mean 'session'? There are ...".
std::string unknownView(SqlReader& reader, const std::string& name) {
  const std::vector<std::string> names = readableNamesOf(reader);
  const std::string all = thereAre(names);
  const auto meant = closestTo(name, names);
  if (!meant) return "unknown view '" + name + "'; " + all;
  return "unknown view '" + name + "'; " + didYouMean(*meant) + " T" + all.substr(1);
}

// The query for the rows; none when an option does not fit the view, which is then printed.
std::optional<std::string> queryFor(Tool& tool, SqlReader& reader, const std::string& view,
                                    const TimeRangeOptions::Range& range) {
  std::string query = "SELECT * FROM " + sqlName(view);
  if (!range.since && !range.until) return query;
  const std::optional<std::string> time = timeColumnOf(columnsOf(reader, view));
  if (!time) {
    tool.status = tool.fail(kWrongUsage, view + " has no time, so --since and --until do not apply");
    return std::nullopt;
  }
  const char* word = " WHERE ";
  if (range.since) {
    query.append(word).append(sqlName(*time)).append(" >= ").append(textOf(*range.since));
    word = " AND ";
  }
  if (range.until) query.append(word).append(sqlName(*time)).append(" <= ").append(textOf(*range.until));
  return query;
}

SqlOutcome write(SqlReader& reader, const std::string& query, const RowFormat& format, std::ostream& out) {
  LiveEvents events(-1, -1);
  reader.interruptWhen(
      [&] { return events.wait(-1, std::chrono::steady_clock::now()) == LiveEvents::Event::kStopped; });
  SqlOutcome outcome = runSql(reader, query, format, out);
  reader.interruptWhen(nullptr);
  return outcome;
}

int writeFile(Tool& tool, SqlReader& reader, const std::string& query, const RowFormat& format,
              const std::string& name) {
  OutputFile file;
  std::error_code error = file.begin(name);
  if (error == std::errc::file_exists) return tool.fail(kRefused, name + ": it exists already");
  if (error) return tool.fail(kRefused, name + ": " + error.message());
  const SqlOutcome outcome = write(reader, query, format, file.stream());
  if (outcome.problem) return tool.fail(kRefused, name + ": " + outcome.problem->text);
  error = file.end();
  if (error) return tool.fail(kRefused, name + ": " + error.message());
  Table(tool.out, tool.asJson, {"rows"}).add({Value(outcome.rows)});
  return kDone;
}

void exportView(Tool& tool, const ExportOptions& options) {
  const std::optional<TimeRangeOptions::Range> range = options.range.range(tool);
  SqlReader reader;
  std::string path;
  if (!range || !openStoreSql(tool, reader, path)) return;
  const std::optional<std::string> view = nameInStore(reader, options.view);
  if (!view) {
    tool.status = tool.fail(kWrongUsage, unknownView(reader, options.view));
    return;
  }
  const std::optional<std::string> query = queryFor(tool, reader, *view, *range);
  if (!query) return;
  RowFormat format;
  format.kind = options.format == "csv" ? RowFormat::Kind::kCsv : RowFormat::Kind::kJson;
  if (options.file) {
    tool.status = writeFile(tool, reader, *query, format, *options.file);
    return;
  }
  format.escapes = tool.outIsTerminal;
  const SqlOutcome outcome = write(reader, *query, format, tool.out);
  if (outcome.problem) tool.status = tool.fail(kRefused, *view + ": " + outcome.problem->text);
}

}  // namespace

void addExportCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "export", "Writes a view of the store for other programs");
  command.footer("`twctl sql` and its .tables show the views.\n" + std::string(TimeRangeOptions::kForms) +
                 "\nThe store is read whether a daemon runs or not.");
  const auto options = std::make_shared<ExportOptions>();
  command.add_option("VIEW", options->view, "The view or table")->required();
  command.add_option("--format", options->format, "How each row is written")
      ->required()
      ->type_name("csv|jsonl")
      ->check(problemWithFormat);
  command.add_option("-o,--output", options->file, "The file to make; else standard output")
      ->type_name("FILE");
  options->range.addTo(command, "rows");
  command.callback([&tool, options] { exportView(tool, *options); });
}

}  // namespace tonewerk
