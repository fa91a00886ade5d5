// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <map>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <system_error>
#include <vector>

#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/OutputFile.h"
#include "tools/twctl/commands/StoreSql.h"
#include "tools/twctl/sessions/ChromeTrace.h"

namespace tonewerk {
namespace {

struct TraceOptions {
  std::int64_t session = 0;
  std::string file;
};

int trace(Tool& tool, const TraceOptions& options) {
  SqlReader reader;
  std::string text;
  if (!openStoreSql(tool, reader, text)) return tool.status;
  const std::optional<StoredSession> session = readSession(reader, options.session, text);
  if (!session) return tool.fail(kRefused, text);
  const std::optional<SessionRecords> records = readRecords(reader, options.session, text);
  if (!records) return tool.fail(kRefused, text);
  const auto texts = readCycles(reader, options.session, text);
  if (!texts) return tool.fail(kRefused, text);
  std::map<std::int64_t, std::vector<GlitchCycle>> cycles;
  for (const auto& [event, json] : *texts) cycles.emplace(event, GlitchCycles::read(json, tool.json));
  OutputFile file;
  std::error_code error = file.begin(options.file);
  if (error == std::errc::file_exists) return tool.fail(kRefused, options.file + ": it exists already");
  if (error) return tool.fail(kRefused, options.file + ": " + error.message());
  file.stream() << chromeTrace(*session, *records, cycles);
  error = file.end();
  return error ? tool.fail(kRefused, options.file + ": " + error.message()) : kDone;
}

}  // namespace

void addTraceCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "trace", "Writes a session as a trace for Perfetto's viewer");
  command.footer(
      "The file is Chrome trace JSON: playing, recording and devices over time, the volume, issues, and the\n"
      "cycles around glitches, as far as the store has them. Open it at https://ui.perfetto.dev, which keeps "
      "it in the browser.");
  const auto options = std::make_shared<TraceOptions>();
  command.add_option("--session", options->session, "The session: the first column of `twctl sessions`")
      ->required()
      ->type_name("ID")
      ->check(CLI::PositiveNumber);
  command.add_option("-o,--output", options->file, "The file to make")->required()->type_name("FILE");
  command.callback([&tool, options] { tool.status = trace(tool, *options); });
}

}  // namespace tonewerk
