// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <cstdlib>
#include <langinfo.h>
#include <locale.h>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <string_view>
#include <utility>

#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/StoreSql.h"
#include "tools/twctl/glitches/GlitchStory.h"
#include "tools/twctl/glitches/GlitchesTable.h"
#include "tools/twctl/input/EventFilterOptions.h"
#include "tools/twctl/input/Suggestion.h"
#include "tools/twctl/input/TimeRangeOptions.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Terminal.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

constexpr std::int64_t kFirstShown = 10;

struct GlitchesOptions {
  GlitchFilter filter;
  TimeRangeOptions range;
  std::optional<std::string> limit;
  std::string by;
  std::optional<std::string> why;
};

constexpr std::array<std::pair<const char*, GlitchKey>, 4> kKeys{{{"application", GlitchKey::kApplication},
                                                                  {"cause", GlitchKey::kCause},
                                                                  {"device", GlitchKey::kDevice},
                                                                  {"hour", GlitchKey::kHour}}};

std::optional<GlitchKey> keyOf(const std::string& word) {
  for (const auto& [name, key] : kKeys) {
    if (word == name) return key;
  }
  return std::nullopt;
}

std::string problemWithKey(const std::string& word) {
  if (keyOf(word)) return {};
  return "glitches are not added up by '" + word + "'; " +
         hintFor(word, {"application", "cause", "device", "hour"});
}

std::string variable(const char* name) {
  const char* value = std::getenv(name);
  return value == nullptr ? "" : value;
}

// Whether the terminal's characters are UTF-8, as the locale of the environment says.
bool isUtf8Locale() {
  const locale_t locale = ::newlocale(LC_CTYPE_MASK, "", nullptr);
  if (locale == nullptr) return false;
  const bool isUtf8 = std::string_view(::nl_langinfo_l(CODESET, locale)) == "UTF-8";
  ::freelocale(locale);
  return isUtf8;
}

GlitchPicture::Look lookOf(const Tool& tool, std::optional<std::size_t> width) {
  constexpr std::size_t kWidest = 100;
  GlitchPicture::Look look;
  look.width = std::min(width.value_or(look.width), kWidest);
  look.isUnicode = isUtf8Locale();
  look.isColoured = tool.outIsTerminal && variable("NO_COLOR").empty() && variable("TERM") != "dumb";
  return look;
}

// The number of an event of the newest glitch; none when there is no glitch, or the store cannot be read.
std::optional<std::string> newestOf(SqlReader& reader, GlitchFilter filter, std::string& problem) {
  std::optional<std::string> found;
  filter.limit = 1;
  if (readGlitches(reader, filter, problem,
                   [&](const StoredGlitch& glitch) { found = std::to_string(glitch.verdict.event); }) &&
      !found) {
    problem = "no glitch was recorded, or none that was asked for";
  }
  return found;
}

int why(Tool& tool, SqlReader& reader, const std::string& wanted, const GlitchFilter& filter,
        std::optional<std::size_t> width) {
  std::string problem;
  const std::optional<std::string> id = wanted == "latest" ? newestOf(reader, filter, problem) : wanted;
  if (!id) return tool.fail(kRefused, problem);
  const std::optional<GlitchInSessions> glitch = readGlitch(reader, *id, problem);
  if (!glitch) return tool.fail(kRefused, problem);
  const GlitchStory story(*glitch, GlitchCycles::read(glitch->cycles, tool.json));
  if (!tool.asJson) {
    story.print(tool.out, lookOf(tool, width), width);
    return kDone;
  }
  std::string text;
  appendCompactJson(text, story.object());
  tool.out << printable(std::move(text)) << '\n';
  return kDone;
}

int sums(Tool& tool, SqlReader& reader, const GlitchFilter& filter, const std::string& by,
         std::optional<std::size_t> width) {
  std::string problem;
  const auto found = sumGlitches(reader, filter, *keyOf(by), problem);
  if (!found) return tool.fail(kRefused, problem);
  if (!tool.asJson) {
    const std::int64_t all = found->glitches;
    tool.out << (all == 0   ? "No glitch was recorded.\n"
                 : all == 1 ? "1 glitch\n\n"
                            : std::to_string(all) + " glitches\n\n");
  }
  GlitchSumsTable table(tool.out, tool.asJson, by, width);
  for (const GlitchSum& sum : found->sums) table.add(sum);
  return kDone;
}

int list(Tool& tool, SqlReader& reader, const GlitchFilter& filter, std::optional<std::size_t> width) {
  std::string problem;
  bool isEmpty = true;
  GlitchesTable table(tool.out, tool.asJson, width);
  if (!readGlitches(reader, filter, problem, [&](const StoredGlitch& glitch) {
        isEmpty = false;
        table.add(glitch);
      })) {
    return tool.fail(kRefused, problem);
  }
  if (isEmpty && !tool.asJson) tool.out << "No glitch was recorded.\n";
  return kDone;
}

int glitches(Tool& tool, const GlitchesOptions& options) {
  const std::optional<TimeRangeOptions::Range> range = options.range.range(tool);
  SqlReader reader;
  std::string path;
  if (!range || !openStoreSql(tool, reader, path)) return tool.status;
  GlitchFilter filter = options.filter;
  filter.since = range->since;
  filter.until = range->until;
  filter.limit = EventFilterOptions::limitOf(options.limit);
  const PagedOutput pages(tool);
  const std::optional<std::size_t> width = widthOf(tool);
  if (options.why) return why(tool, reader, *options.why, filter, width);
  if (!options.by.empty()) return sums(tool, reader, filter, options.by, width);
  // People who ask for nothing see the last ones.
  if (!options.limit) filter.limit = kFirstShown;
  return list(tool, reader, filter, width);
}

}  // namespace

void addGlitchesCommand(CLI::App& app, Tool& tool) {
  CLI::App& command =
      addCommand(app, tool, "glitches", "The last glitches of the audio: when, why, and whose they were");
  command.footer(
      "  twctl glitches                       the last ten\n"
      "  twctl glitches --by application      who caused how many\n"
      "  twctl glitches --why latest          what happened at the last one, and what to do\n" +
      std::string("A pattern (GLOB) may have *, ? and [...].\n") + TimeRangeOptions::kForms +
      "\nThe PipeWire bridge judges whose a glitch was. The store is read whether a daemon runs or "
      "not.");
  const auto options = std::make_shared<GlitchesOptions>();
  CLI::Option* by =
      command.add_option("--by", options->by, "Adds them up by application, cause, device or hour")
          ->type_name("KEY")
          ->check(problemWithKey);
  command
      .add_option(
          "--why", options->why,
          "The cycles around one as a picture, and what to do: its id, or latest of those that the other "
          "options choose")
      ->type_name("ID")
      ->excludes(by);
  options->range.addTo(command, "glitches");
  EventFilterOptions::addLimit(command, options->limit);
  command
      .add_option("--app", options->filter.application, "Only those that such applications heard or caused")
      ->type_name("GLOB");
  command.add_option("--device", options->filter.device, "Only those on such devices")->type_name("GLOB");
  EventFilterOptions::addService(command, options->filter.service, "Only those in sessions");
  command
      .add_option("--session", options->filter.session,
                  "Only those in this session, the first column of `twctl "
                  "sessions`")
      ->type_name("ID")
      ->check(problemWithCount);
  command.callback([&tool, options] { tool.status = glitches(tool, *options); });
}

}  // namespace tonewerk
