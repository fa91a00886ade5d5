// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <system_error>
#include <utility>

#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/OutputFile.h"
#include "tools/twctl/commands/ReportReading.h"
#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/report/ReportPage.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

struct ReportOptions {
  std::optional<std::string> file;
  ReportScopeOptions scope;
};

// The file appears when it is complete. Fails when there is such a file already.
std::error_code writeFile(const std::string& name, const std::string& text) {
  OutputFile file;
  if (const std::error_code error = file.begin(name)) return error;
  file.stream() << text;
  return file.end();
}

int report(Tool& tool, const ReportOptions& options) {
  const std::optional<ReportScope> scope = options.scope.scope(tool);
  if (!scope) return tool.status;
  if (!options.file && !tool.asJson && tool.outIsTerminal) {
    return tool.fail(kWrongUsage,
                     "report: a page is no text for a terminal; name a file with -o report.html, or send the "
                     "page on: twctl report > report.html");
  }
  const ReportData report = readReport(tool, *scope, reportedDevice(tool));
  if (!report.problem.empty()) return tool.fail(kRefused, report.problem);
  std::string text;
  if (tool.asJson) {
    appendCompactJson(text, report.data);
    text = printable(std::move(text)) + "\n";
  } else {
    text = reportPage(report.data, newNonce());
  }
  if (!options.file) {
    tool.out << text;
    return kDone;
  }
  const std::error_code error = writeFile(*options.file, text);
  if (error == std::errc::file_exists) return tool.fail(kRefused, *options.file + ": it exists already");
  if (error) return tool.fail(kRefused, *options.file + ": " + error.message());
  return kDone;
}

}  // namespace

void addReportCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "report", "Makes one page with pictures of what the store has");
  command.footer(
      "The page is one HTML file that needs no network. It goes to standard output, or to the FILE of -o, "
      "which\n"
      "must not exist. With --json its data are printed instead, as one object. The store is read whether a\n"
      "daemon runs or not; what a daemon says of itself is on the page when one answers.\n" +
      std::string(TimeRangeOptions::kForms));
  const auto options = std::make_shared<ReportOptions>();
  command.add_option("-o,--output", options->file, "The page to make")->type_name("FILE");
  options->scope.addTo(command);
  command.callback([&tool, options] { tool.status = report(tool, *options); });
}

}  // namespace tonewerk
