// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <array>
#include <chrono>
#include <climits>
#include <filesystem>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

#include "platform/linux/files/LinuxFileSystem.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/RecordedDevice.h"
#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/report/DaemonHealth.h"
#include "tools/twctl/report/ReportData.h"
#include "tools/twctl/report/ReportPage.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

struct ReportOptions {
  std::optional<std::string> file;
  std::optional<std::int64_t> session;
  std::optional<std::string> application;
  TimeRangeOptions range;
};

// Makes files that only their owner may read: a page says what people at this device listened to, and when.
class OwnerOnly {
 public:
  OwnerOnly() : before_(umask(S_IRWXG | S_IRWXO)) {}
  OwnerOnly(const OwnerOnly&) = delete;
  OwnerOnly& operator=(const OwnerOnly&) = delete;
  ~OwnerOnly() { umask(before_); }

 private:
  const mode_t before_;
};

// The file appears when it is complete. Fails when there is such a file already.
std::error_code writeFile(const std::string& file, const std::string& text) {
  std::error_code error;
  const std::filesystem::path path = std::filesystem::absolute(file, error);
  if (error) return error;
  LinuxFileSystem files;
  const OwnerOnly scope;
  const std::unique_ptr<NewFile> made = files.createFile(path.parent_path(), path.filename(), error);
  if (!error) error = made->write(text);
  if (!error) error = made->place(path.filename());
  return error;
}

std::string hostName() {
  std::array<char, HOST_NAME_MAX + 1> name{};
  return gethostname(name.data(), name.size() - 1) == 0 ? name.data() : "";
}

ValueMap deviceOf(const Tool& tool) {
  ValueMap device{{"host", hostName()}};
  const ValueMap recorded = recordedDevice(tool, geteuid());
  const Value* preferences = recorded.find("preferences");
  const Value* domain = preferences == nullptr ? nullptr : preferences->asMap()->find("com.orvane.tonewerk");
  if (domain != nullptr && domain->asMap()->contains("device_name"))
    device.set("name", domain->asMap()->text("device_name"));
  return device;
}

ValueMap filterOf(const ReportScope& scope) {
  ValueMap filter;
  if (scope.since) filter.set("since", *scope.since);
  if (scope.until) filter.set("until", *scope.until);
  if (scope.application) filter.set("application", *scope.application);
  return filter;
}

int report(Tool& tool, const ReportOptions& options) {
  const std::optional<TimeRangeOptions::Range> range = options.range.range(tool);
  if (!range) return tool.status;
  if (!options.file && !tool.asJson && tool.outIsTerminal) {
    return tool.fail(kWrongUsage,
                     "report: a page is no text for a terminal; name a file with -o report.html, or send the "
                     "page on: twctl report > report.html");
  }
  const ReportScope scope{range->since, range->until, options.application, options.session};
  const double now =
      std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  ReportData report = ReportData::read(tool.directories().state, scope, now);
  if (!report.problem.empty()) return tool.fail(kRefused, report.problem);
  report.data.set("version", TONEWERK_VERSION);
  report.data.set("device", deviceOf(tool));
  report.data.set("filter", filterOf(scope));
  report.data.set("daemon", daemonHealth(tool));
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
  command
      .add_option("--session", options->session,
                  "Only this session: the id of the store's view session, which the page shows as #ID")
      ->type_name("ID")
      ->check(CLI::PositiveNumber);
  command.add_option("--app", options->application, "Only applications that this pattern fits (*, ?, [...])")
      ->type_name("GLOB");
  options->range.addTo(command, "what happened");
  command.callback([&tool, options] { tool.status = report(tool, *options); });
}

}  // namespace tonewerk
