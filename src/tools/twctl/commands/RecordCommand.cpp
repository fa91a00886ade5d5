// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <cerrno>
#include <chrono>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <sys/stat.h>
#include <system_error>

#include "platform/linux/journal/JournalReader.h"
#include "tools/journal/JournalRecorder.h"
#include "tools/recording/RecordingWriter.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/LiveEvents.h"
#include "tools/twctl/commands/OutputFile.h"
#include "tools/twctl/commands/RecordedDevice.h"
#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/Table.h"

namespace tonewerk {
namespace {

// So many records are between two looks at whether the user has interrupted the command.
constexpr std::uint64_t kRecordsPerLook = 256;

struct RecordOptions {
  std::string file;
  std::optional<ReporterID> session;
  TimeRangeOptions range;
};

std::string countOf(std::uint64_t count, const char* one, const char* more) {
  return std::to_string(count) + " " + (count == 1 ? one : more);
}

void warnOfLosses(const Tool& tool, const std::string& journal, const JournalReader& reader,
                  const JournalRecorder& recorder) {
  for (const std::string& segment : reader.unread())
    tool.warn(std::string(journal).append("/").append(segment));
  const std::uint64_t places = reader.reading().damagedPlaces;
  if (places > 0) {
    tool.warn(journal + ": damaged at " + countOf(places, "place", "places") + " (" +
              countOf(reader.reading().damagedBytes, "byte", "bytes") + ")");
  }
  if (reader.missing() > 0)
    tool.warn(journal + ": " + countOf(reader.missing(), "record is", "records are") + " missing");
  if (recorder.withoutClient() > 0) {
    tool.warn(journal + ": " + countOf(recorder.withoutClient(), "request is", "requests are") +
              " left out, because the beginning of the client is missing");
  }
}

// Why there is nothing to record.
std::string problemWithNothing(const std::string& journal, const SessionChoice::Wanted& wanted,
                               bool isEmpty) {
  if (isEmpty) return journal + ": it has no requests";
  if (wanted.session) {
    const bool hasTime = wanted.since || wanted.until;
    return journal + ": it has no session " + std::to_string(*wanted.session) +
           (hasTime ? " of this time" : "");
  }
  return journal + ": it has no requests of this time";
}

int record(Tool& tool, const RecordOptions& options) {
  const std::optional<TimeRangeOptions::Range> range = options.range.range(tool);
  if (!range) return tool.status;
  const SessionChoice::Wanted wanted{options.session, range->since, range->until};
  const std::string journal = tool.directories().state + "/journal";
  LinuxJournalDirectory directory(journal);
  std::error_code error = directory.openToRead();
  struct stat status {};
  if (!error && stat(journal.c_str(), &status) != 0) error = {errno, std::generic_category()};
  if (error == std::errc::no_such_file_or_directory)
    return tool.fail(kRefused, journal + ": there is no journal");
  if (error) return tool.fail(kRefused, journal + ": " + error.message());

  LiveEvents events(-1, -1);
  OutputFile file;
  error = file.begin(options.file);
  if (error == std::errc::file_exists) return tool.fail(kRefused, options.file + ": it exists already");
  if (error) return tool.fail(kRefused, options.file + ": " + error.message());
  std::ostream& out = file.stream();
  RecordingWriter writer(out, tool.json, recordedDevice(tool, status.st_uid));
  JournalRecorder recorder(writer, SessionChoice(wanted, status.st_uid));
  JournalReader reader(directory);
  bool isInterrupted = false;
  error = reader.read([&](const Journal::Record& record, bool isFirstOfProcess) {
    if (isFirstOfProcess) recorder.endProcess();
    recorder.take(record);
    if (reader.reading().records % kRecordsPerLook == 0) {
      isInterrupted = events.wait(-1, std::chrono::steady_clock::now()) == LiveEvents::Event::kStopped;
    }
    return !isInterrupted && out.good();
  });
  recorder.end();
  if (isInterrupted) return tool.fail(kRefused, options.file + ": interrupted");
  if (error) return tool.fail(kRefused, journal + ": " + error.message());
  warnOfLosses(tool, journal, reader, recorder);
  if (recorder.requests() == 0) {
    return tool.fail(kRefused, problemWithNothing(journal, wanted, reader.reading().records == 0));
  }
  (void)writer.finish();  // the file knows the reason
  if (const std::error_code failure = file.end())
    return tool.fail(kRefused, options.file + ": " + failure.message());
  Table(tool.out, tool.asJson, {"sessions", "requests"})
      .add({Value(recorder.sessions()), Value(recorder.requests())});
  return kDone;
}

}  // namespace

void addRecordCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "record", "Writes the journal's sessions as a recording");
  command.footer(
      "The journal has the requests of open sessions. It keeps those of others, too, for so many days:\n"
      "  twctl defaults write com.orvane.tonewerk.store journal_days 7\n"
      "It is read whether a daemon runs or not, by the daemon's user or root. To play the recording:\n"
      "  twctl replay --offline FILE -o STORE\n" +
      std::string(TimeRangeOptions::kForms));
  const auto options = std::make_shared<RecordOptions>();
  command.add_option("-o,--output", options->file, "The recording to make")->required()->type_name("FILE");
  command.add_option("--session", options->session, "Only the sessions with this identifier")
      ->type_name("ID")
      ->check(problemWithReporterID);
  options->range.addTo(command, "sessions created");
  command.callback([&tool, options] { tool.status = record(tool, *options); });
}

}  // namespace tonewerk
