// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <chrono>
#include <cstdlib>
#include <istream>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <unistd.h>

#include "platform/linux/directories/Directories.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/LiveEvents.h"
#include "tools/twctl/commands/StoreSql.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Terminal.h"
#include "tools/twctl/sql/EditedLines.h"
#include "tools/twctl/sql/SqlCompletion.h"
#include "tools/twctl/sql/SqlPrompt.h"
#include "tools/twctl/sql/SqlRun.h"

namespace tonewerk {
namespace {

// SQLite takes no longer statements.
constexpr std::size_t kMaxQueryBytes = 1'000'000;

struct SqlOptions {
  std::optional<std::string> query;
  bool asCsv = false;
};

RowFormat formatFor(const Tool& tool, bool asCsv) {
  RowFormat format;
  format.kind = asCsv         ? RowFormat::Kind::kCsv
                : tool.asJson ? RowFormat::Kind::kJson
                              : RowFormat::Kind::kTable;
  format.escapes = tool.outIsTerminal;
  format.width = widthOf(tool);
  return format;
}

int runQuery(Tool& tool, SqlReader& reader, const std::string& query, const RowFormat& format) {
  LiveEvents events(-1, -1);
  reader.interruptWhen(
      [&] { return events.wait(-1, std::chrono::steady_clock::now()) == LiveEvents::Event::kStopped; });
  const SqlOutcome outcome = runSql(reader, query, format, tool.out);
  reader.interruptWhen(nullptr);
  if (!outcome.problem) {
    return outcome.statements > 0 ? kDone : tool.fail(kWrongUsage, "the query is empty");
  }
  // The terminal shows the pressed keys.
  if (outcome.problem->kind == SqlProblem::Kind::kInterrupted && tool.outIsTerminal) tool.out << '\n';
  tool.out.flush();
  tool.err << "twctl: " << describe(*outcome.problem, query) << '\n';
  return outcome.problem->kind == SqlProblem::Kind::kQuery ? kWrongUsage : kRefused;
}

// None when the input is too long.
std::optional<std::string> queryFrom(std::istream& in) {
  std::string query(kMaxQueryBytes + 1, '\0');
  in.read(query.data(), static_cast<std::streamsize>(query.size()));
  query.resize(static_cast<std::size_t>(in.gcount()));
  return query.size() > kMaxQueryBytes ? std::nullopt : std::optional(query);
}

// In the user's own directory, whichever store is read.
std::string historyFile() {
  const auto variable = [](const std::string& name) -> std::optional<std::string> {
    if (name.ends_with("_DIRECTORY")) return std::nullopt;
    const char* value = std::getenv(name.c_str());
    return value == nullptr ? std::nullopt : std::optional<std::string>(value);
  };
  return Directories::from(variable, ::geteuid()).state + "/sql-history";
}

void prompt(Tool& tool, SqlReader& reader, const std::string& path, bool asCsv) {
  const SqlCompletion completion(reader);
  EditedLines lines(historyFile(), [&](std::string_view line) { return completion.complete(line); });
  SqlPrompt(tool, reader, lines, path)
      .run([&] { return formatFor(tool, asCsv); },
           [&](const std::string& statement, const RowFormat& format) {
             (void)runQuery(tool, reader, statement, format);
           });
}

void sql(Tool& tool, const SqlOptions& options) {
  if (options.asCsv && tool.asJson) {
    tool.status = tool.fail(kWrongUsage, "--csv excludes --json");
    return;
  }
  std::optional<std::string> query = options.query;
  const bool atPrompt = !query && tool.inDescriptor >= 0 && tool.outIsTerminal;
  SqlReader reader;
  std::string path;
  if (!openStoreSql(tool, reader, path)) return;
  if (atPrompt) {
    prompt(tool, reader, path, options.asCsv);
    return;
  }
  if (!query && tool.in != nullptr) query = queryFrom(*tool.in);
  const PagedOutput pages(tool);
  tool.status = query ? runQuery(tool, reader, *query, formatFor(tool, options.asCsv))
                      : tool.fail(kWrongUsage, "the query has more than 1000000 bytes");
}

}  // namespace

void addSqlCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "sql", "Runs SQL on the store, which it only reads");
  command.footer(
      "Without QUERY it reads the query from standard input; on a terminal it is a prompt.\n"
      "  twctl sql \"SELECT application, sum(seconds) FROM volume_stretch GROUP BY 1\"\n"
      "The store is read whether a daemon runs or not.");
  const auto options = std::make_shared<SqlOptions>();
  command.add_option("QUERY", options->query, "One or more SELECT statements");
  command.add_flag("--csv", options->asCsv, "CSV instead of a table");
  command.callback([&tool, options] { sql(tool, *options); });
}

}  // namespace tonewerk
