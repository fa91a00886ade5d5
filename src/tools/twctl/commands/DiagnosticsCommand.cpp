// SPDX-License-Identifier: Apache-2.0
//
// The commands captures, drafts and whirlcaps, which show and delete what diagnostics have stored.
#include <CLI/CLI.hpp>
#include <iomanip>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/input/TimeArgument.h"
#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/show/DiagnosticSummary.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Table.h"
#include "values/PrintableText.h"
#include "values/ShortenedText.h"

namespace tonewerk {
namespace {

constexpr const char* kRequestFile = "request.json";

// One of the three commands with its arguments.
struct DiagnosticsCommand {
  DiagnosticKind kind;
  std::string noun;  // of one item
  std::vector<std::string> names = {};
  bool latest = false;
  bool all = false;
  TimeRangeOptions range = {};
  std::optional<std::string> limit = std::nullopt;
};

using Entry = DiagnosticsDirectory::Entry;

DiagnosticsDirectory directoryOf(const Tool& tool) { return DiagnosticsDirectory(tool.directories().state); }

// False when the items cannot be read; the problem is then printed.
bool canRead(Tool& tool, const DiagnosticsDirectory& directory, DiagnosticKind kind) {
  const std::error_code error = directory.checkReadable(kind);
  if (!error) return true;
  tool.status = tool.fail(kRefused, "cannot read " + directory.pathOf(kind, "") + ": " + error.message());
  return false;
}

// An item of the list; none of a summary where the request cannot be read.
struct Shown {
  Entry entry;
  std::optional<DiagnosticSummary> summary;
};

// Those of the time and the number that are asked for, oldest first. A time leaves out items whose own time
// is not known.
std::vector<Shown> chosen(const DiagnosticsDirectory& directory, const DiagnosticsCommand& command,
                          const TimeRangeOptions::Range& range) {
  std::vector<Shown> all;
  for (Entry& entry : directory.list(command.kind)) {
    const auto text = directory.readFile(command.kind, entry.name, kRequestFile);
    auto summary = DiagnosticSummary::read(command.kind, text.value_or(""));
    const auto when = summary ? timeOfArgument(summary->when, 0.0) : std::nullopt;
    const bool isOut =
        (range.since && (!when || *when < *range.since)) || (range.until && (!when || *when > *range.until));
    if (!isOut) all.push_back({std::move(entry), std::move(summary)});
  }
  const auto limit = EventFilterOptions::limitOf(command.limit);
  if (limit && static_cast<std::size_t>(*limit) < all.size())
    all.erase(all.begin(), all.end() - static_cast<std::ptrdiff_t>(*limit));
  return all;
}

// For people in the local zone, as all times; for programs as it is in the file.
Table::Cell whenCell(const DiagnosticSummary& summary) {
  const auto when = timeOfArgument(summary.when, 0.0);
  if (!when) return Value(summary.when);
  Table::Cell cell = Table::Cell::time(*when);
  cell.json = Table::Cell(Value(summary.when)).json;
  return cell;
}

void list(Tool& tool, const DiagnosticsCommand& command) {
  const std::optional<TimeRangeOptions::Range> range = command.range.range(tool);
  if (!range) return;
  const PagedOutput pages(tool);
  const DiagnosticsDirectory directory = directoryOf(tool);
  if (!canRead(tool, directory, command.kind)) return;
  Table table(tool, {"id", "when", "what", "process", "bytes", "problems"});
  table.dropWhenNarrow({"problems", "bytes", "process"});
  for (const Shown& shown : chosen(directory, command, *range)) {
    const auto& [entry, summary] = shown;
    if (!summary) {
      table.add({Value(entry.name), Value(""), Value("(request.json cannot be read)"), Value(""),
                 Value(entry.bytes), Value(0)});
      continue;
    }
    table.add({Value(entry.name), whenCell(*summary), Value(summary->what), Value(summary->process),
               Value(entry.bytes), Value(summary->problems.size())});
  }
}

void printField(std::ostream& out, const char* name, const std::string& value) {
  if (!value.empty()) out << "  " << std::left << std::setw(10) << name << printable(value) << '\n';
}

// The beginning of a text that fits on a screen, cut between characters.
std::string beginningOf(const std::string& text) {
  constexpr std::size_t kMax = 1000;
  const std::string_view beginning = shortened(text, kMax);
  return std::string(beginning) + (beginning.size() < text.size() ? " ..." : "");
}

void printSummary(std::ostream& out, const DiagnosticSummary& summary) {
  printField(out, "what", summary.what);
  const auto when = timeOfArgument(summary.when, 0.0);
  printField(out, "when", when ? localTime(*when) : summary.when);
  printField(out, "why", summary.why);
  printField(out, "process", summary.process);
  printField(out, "component", summary.component);
  printField(out, "duration", summary.duration.empty() ? "" : summary.duration + " s");
  printField(out, "payload", beginningOf(summary.payload));
}

void printForPeople(std::ostream& out, const DiagnosticsDirectory& directory,
                    const DiagnosticsCommand& command, const std::string& name,
                    const std::optional<std::string>& request) {
  const auto summary = DiagnosticSummary::read(command.kind, request.value_or(""));
  out << command.noun << ' ' << printable(name) << '\n';
  if (summary) {
    printSummary(out, *summary);
  } else {
    out << "  request.json cannot be read\n";
  }
  printField(out, "folder", directory.pathOf(command.kind, name));
  out << '\n';
  {
    Table table(out, false, {"file", "bytes"});
    for (const auto& file : directory.filesOf(command.kind, name))
      table.add({Value(file.name), Value(file.bytes)});
  }
  if (!summary || summary->problems.empty()) return;
  out << "\nmissing or incomplete:\n";
  for (const auto& [file, problem] : summary->problems) out << "  " << file << ": " << problem << '\n';
}

void printForPrograms(std::ostream& out, const DiagnosticsDirectory& directory,
                      const DiagnosticsCommand& command, const std::string& name,
                      const std::optional<std::string>& request) {
  ValueArray files;
  for (const auto& file : directory.filesOf(command.kind, name)) {
    files.append(ValueMap{{"name", file.name}, {"bytes", file.bytes}});
  }
  const std::string json = compactJson(request.value_or(""));
  Table table(out, true, {"id", "folder", "files", "request"});
  table.add({Value(name), Value(directory.pathOf(command.kind, name)), Value(files), {json, json}});
}

// The item that the command line names. None when it does not exist; the problem is then printed.
std::optional<std::string> nameOf(Tool& tool, const DiagnosticsDirectory& directory,
                                  const DiagnosticsCommand& command) {
  if (command.latest == !command.names.empty()) {
    tool.status = tool.fail(kWrongUsage, "either an ID or --latest");
    return std::nullopt;
  }
  if (!canRead(tool, directory, command.kind)) return std::nullopt;
  if (command.latest) {
    std::vector<Entry> entries = directory.list(command.kind);
    if (!entries.empty()) return std::move(entries.back().name);
    tool.status = tool.fail(kRefused, "there is no " + command.noun);
    return std::nullopt;
  }
  if (directory.contains(command.kind, command.names.front())) return command.names.front();
  tool.status = tool.fail(kRefused, "there is no " + command.noun + " \"" + command.names.front() + "\"");
  return std::nullopt;
}

void show(Tool& tool, const DiagnosticsCommand& command) {
  const PagedOutput pages(tool);
  const DiagnosticsDirectory directory = directoryOf(tool);
  const std::optional<std::string> name = nameOf(tool, directory, command);
  if (!name) return;
  const auto request = directory.readFile(command.kind, *name, kRequestFile);
  (tool.asJson ? printForPrograms : printForPeople)(tool.out, directory, command, *name, request);
}

// Deletes the others when one cannot be deleted.
void remove(Tool& tool, const DiagnosticsCommand& command) {
  if (command.all == !command.names.empty()) {
    tool.status = tool.fail(kWrongUsage, "either IDs or --all");
    return;
  }
  const DiagnosticsDirectory directory = directoryOf(tool);
  if (!canRead(tool, directory, command.kind)) return;
  std::vector<std::string> names = command.names;
  if (command.all) {
    for (Entry& entry : directory.list(command.kind)) names.push_back(std::move(entry.name));
  }
  for (const std::string& name : names) {
    const std::error_code error = directory.remove(command.kind, name);
    if (error == std::errc::no_such_file_or_directory) {
      tool.status = tool.fail(kRefused, "there is no " + command.noun + " \"" + name + "\"");
    } else if (error) {
      tool.status = tool.fail(kRefused, "cannot delete " + name + ": " + error.message());
    }
  }
}

void addListOptions(CLI::App& command, DiagnosticsCommand& options) {
  options.range.addTo(command, "those");
  EventFilterOptions::addLimit(command, options.limit);
  EventFilterOptions::refuse(
      command, {"--app", "--device", "--service", "--session"},
      "what is collected does not say which session it is for; --since and --until choose its time");
}

void addDiagnosticsCommand(CLI::App& app, Tool& tool, const std::string& name, const std::string& description,
                           DiagnosticsCommand initial) {
  const auto options = std::make_shared<DiagnosticsCommand>(std::move(initial));
  CLI::App& command = addCommand(app, tool, name, description);
  command.require_subcommand(0, 1);
  addListOptions(command, *options);
  command.callback([&tool, &command, options] {
    if (command.get_subcommands().empty()) list(tool, *options);
  });

  CLI::App& listing = addCommand(command, tool, "list", "All of them, oldest first; also without a word");
  addListOptions(listing, *options);
  listing.callback([&tool, options] { list(tool, *options); });

  CLI::App& showing = addCommand(command, tool, "show", "What one is about and what was collected");
  showing.add_option("ID", options->names, "As listed")->expected(0, 1);
  showing.add_flag("--latest", options->latest, "The one made last");
  showing.callback([&tool, options] { show(tool, *options); });

  CLI::App& deleting = addCommand(command, tool, "delete", "Deletes them with all that was collected");
  deleting.add_option("ID", options->names, "As listed");
  deleting.add_flag("--all", options->all, "All of them");
  deleting.callback([&tool, options] { remove(tool, *options); });
}

}  // namespace

void addDiagnosticsCommands(CLI::App& app, Tool& tool) {
  addDiagnosticsCommand(app, tool, "captures", "The diagnostic captures",
                        {DiagnosticKind::kCapture, "capture"});
  addDiagnosticsCommand(app, tool, "drafts", "The drafts of bug reports",
                        {DiagnosticKind::kIssueDraft, "draft"});
  addDiagnosticsCommand(app, tool, "whirlcaps", "The stall traces", {DiagnosticKind::kWhirlcap, "whirlcap"});
}

}  // namespace tonewerk
