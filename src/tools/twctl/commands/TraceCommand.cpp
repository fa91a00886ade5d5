// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <limits>
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
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/sessions/ChromeTrace.h"

namespace tonewerk {
namespace {

struct TraceOptions {
  std::int64_t session = 0;
  std::string file;
  std::string signposts;  // a file; empty for those of the daemon
};

// The intervals in the file that the user named; none when it cannot be used.
std::optional<Signposts> signpostsIn(Tool& tool, const std::string& path, const SignpostFilter& filter) {
  std::string problem = "it is no file";
  std::error_code ignored;
  std::ifstream file(path);
  std::optional<Signposts> found;
  if (std::filesystem::is_regular_file(path, ignored)) {
    problem = "it cannot be opened";
    if (file.is_open()) found = readSignposts(file, filter, tool.json, problem);
  }
  if (found && !found->haveTimes)
    problem = "it does not say when its intervals began; earlier daemons did not";
  if (found && found->haveTimes && found->intervals.empty())
    problem = "none of its intervals began while the session was there";
  if (found && !found->intervals.empty()) return found;
  tool.status = tool.fail(kRefused, path + ": " + problem);
  return std::nullopt;
}

// The intervals of the session in what the daemon has written. A session that was started again has several
// files.
Signposts signpostsOf(const Tool& tool, const SignpostFilter& filter) {
  Signposts all;
  std::error_code error;
  std::filesystem::directory_iterator at(tool.directories().logs + "/Audio/Traces", error);
  for (; !error && at != std::filesystem::directory_iterator(); at.increment(error)) {
    std::error_code isNone;
    if (!at->is_regular_file(isNone) || at->path().extension() != ".bdj") continue;
    std::ifstream file(at->path());
    std::string ignored;
    std::optional<Signposts> one = readSignposts(file, filter, tool.json, ignored);
    if (!one) continue;
    std::move(one->intervals.begin(), one->intervals.end(), std::back_inserter(all.intervals));
    all.leftOut += one->leftOut;
  }
  return all;
}

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
  SignpostFilter filter;
  filter.since = session->startedAt;
  filter.until = session->endedAt.value_or(std::numeric_limits<double>::infinity());
  if (options.signposts.empty()) filter.reporterID = session->reporterID;
  const std::optional<Signposts> signposts =
      options.signposts.empty() ? signpostsOf(tool, filter) : signpostsIn(tool, options.signposts, filter);
  if (!signposts) return tool.status;
  if (signposts->leftOut > 0)
    tool.warn(std::to_string(signposts->leftOut) + " intervals of signposts are left out, only the first " +
              std::to_string(SignpostFilter::kMostIntervals) + " of a file are in the trace");
  OutputFile file;
  std::error_code error = file.begin(options.file);
  if (error == std::errc::file_exists) return tool.fail(kRefused, options.file + ": it exists already");
  if (error) return tool.fail(kRefused, options.file + ": " + error.message());
  file.stream() << chromeTrace(*session, *records, cycles, signposts->intervals);
  error = file.end();
  return error ? tool.fail(kRefused, options.file + ": " + error.message()) : kDone;
}

}  // namespace

void addTraceCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "trace", "Writes a session as a trace for Perfetto's viewer");
  command.footer(
      "The file is Chrome trace JSON: playing, recording and devices over time, the volume, issues, and the\n"
      "cycles around glitches, as far as the store has them. For a test session that was traced, also the\n"
      "intervals of signposts. Open it at https://ui.perfetto.dev, which keeps "
      "it in the browser.");
  const auto options = std::make_shared<TraceOptions>();
  command.add_option("--session", options->session, "The session: the first column of `twctl sessions`")
      ->required()
      ->type_name("ID")
      ->check(problemWithCount);
  command
      .add_option(
          "--signposts", options->signposts,
          "The benchmark data file of a performance trace; when it is not given, those of the session "
          "in the daemon's directory of logs")
      ->type_name("FILE");
  command.add_option("-o,--output", options->file, "The file to make")->required()->type_name("FILE");
  command.callback([&tool, options] { tool.status = trace(tool, *options); });
}

}  // namespace tonewerk
