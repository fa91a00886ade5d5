// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <memory>
#include <optional>
#include <ostream>
#include <string>

#include "tools/recording/ReasonKeys.h"
#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/commands/SessionReplay.h"
#include "tools/twctl/commands/StoreSql.h"
#include "tools/twctl/input/Suggestion.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/sessions/SessionStory.h"
#include "tools/twctl/sessions/SessionsTable.h"
#include "tools/twctl/show/PagedOutput.h"
#include "tools/twctl/show/Terminal.h"
#include "values/CompactJson.h"
#include "values/PrintableText.h"

namespace tonewerk {
namespace {

// Everything that is known of one session.
struct KnownSession {
  StoredSession session;
  SessionRecords records;
  SessionReplay replay;
  const ReasonedLife* life = nullptr;
};

// False when it is not there; the problem is then printed.
bool find(Tool& tool, SqlReader& reader, std::int64_t id, KnownSession& known) {
  std::string problem;
  const std::optional<StoredSession> session = readSession(reader, id, problem);
  std::optional<SessionRecords> records;
  if (session) records = readRecords(reader, id, problem);
  if (!records) {
    tool.status = tool.fail(kRefused, problem);
    return false;
  }
  known.session = *session;
  known.records = *std::move(records);
  ReasonedLife* life = known.replay.play(tool, known.session);
  known.life = life;
  if (life == nullptr) return true;
  const auto events = readPayloads(reader, id, problem);
  if (!events) {
    tool.status = tool.fail(kRefused, problem);
    return false;
  }
  nameEvents(*life, *events, tool.json);
  return true;
}

SessionStory storyOf(const Tool& tool, const KnownSession& known) {
  return SessionStory(known.session, known.records, known.life, known.replay.why(), widthOf(tool));
}

void printLine(Tool& tool, const ValueMap& line) {
  std::string text;
  appendCompactJson(text, line);
  tool.out << printable(std::move(text)) << '\n';
}

void printUnknown(Tool& tool, const KnownSession& known) {
  printLine(tool, {{reasons::kWhat, "unknown"}, {"why", known.replay.why()}});
}

void printWalk(Tool& tool, const ReasonedLife::Walk& walk) {
  printLine(tool, walk.about);
  for (const ValueMap& step : walk.steps) printLine(tool, step);
  printLine(tool, walk.end);
}

// With the names of the view `glitch`.
void addVerdict(ValueMap& line, const GlitchVerdict& verdict) {
  if (verdict.id) line.set("glitch_id", *verdict.id);
  if (verdict.cause) line.set("cause", *verdict.cause);
  if (verdict.firstCause) line.set("first_cause", *verdict.firstCause);
  line.set("culprit", culpritOf(verdict));
  if (verdict.overMs) line.set("over_ms", *verdict.overMs);
  if (verdict.lostMs) line.set("lost_ms", *verdict.lostMs);
}

// One object a line: the session, then what happened in it, with the keys of the reasons.
void printObjects(Tool& tool, const KnownSession& known) {
  SessionsTable(tool.out, true, known.session.endedAt.value_or(known.session.startedAt), std::nullopt)
      .add(known.session);
  if (known.life == nullptr) {
    printUnknown(tool, known);
  } else {
    for (const ValueMap& message : known.life->messages) printLine(tool, message);
    for (const ReasonedLife::Walk& walk : known.life->walks) printWalk(tool, walk);
    if (known.life->end) printLine(tool, *known.life->end);
  }
  for (const SessionRecords::Issue& issue : known.records.issues) {
    ValueMap line{
        {reasons::kWhat, "issue"}, {"event", issue.event}, {reasons::kAt, issue.at}, {"kind", issue.kind}};
    if (issue.node) line.set("node", *issue.node);
    if (issue.seconds) line.set("seconds", *issue.seconds);
    if (issue.verdict) addVerdict(line, *issue.verdict);
    printLine(tool, line);
  }
}

void session(Tool& tool, std::int64_t id) {
  const PagedOutput pages(tool);
  SqlReader reader;
  std::string path;
  KnownSession known;
  if (!openStoreSql(tool, reader, path) || !find(tool, reader, id, known)) return;
  if (tool.asJson) {
    printObjects(tool, known);
  } else {
    tool.out << printableLines(storyOf(tool, known).whole());
  }
}

struct ExplainOptions {
  std::optional<std::int64_t> event;
  std::optional<std::int64_t> session;
  std::optional<std::int64_t> message;
  std::string missing;
};

// "Volume" for "volume".
std::string categoryOf(std::string word) {
  if (!word.empty()) word.front() = static_cast<char>(word.front() - 'a' + 'A');
  return word;
}

std::string problemWithMissing(const std::string& word) {
  if (word == "volume" || word == "input" || word == "gather") return {};
  return "'" + word + "' is no kind of summary; " + hintFor(word, {"volume", "input", "gather"});
}

// The reasons of an event, one object a line.
void printObjects(Tool& tool, const KnownSession& known, const StoredEventRow& event) {
  const ValueMap* end = event.isSummary() ? known.life->summaryEnd(event.category, *event.summary) : nullptr;
  if (end != nullptr) {
    printLine(tool, known.life->walk(event.category)->about);
    printLine(tool, *end);
    for (const Value& number : *end->find(reasons::kMessages)->asArray()) {
      if (const ValueMap* message = known.life->message(number.integer())) printLine(tool, *message);
    }
  } else if (const ValueMap* message = known.life->messageOf(event.id)) {
    for (const ValueMap* equal : known.life->equalTo(message->integer(reasons::kNumber)))
      printLine(tool, *equal);
  }
}

int explainEvent(Tool& tool, SqlReader& reader, std::int64_t id) {
  const PagedOutput pages(tool);
  std::string problem;
  const std::optional<StoredEventRow> event = readEvent(reader, id, problem);
  if (!event) return tool.fail(kRefused, problem);
  if (!event->session)
    return tool.fail(kRefused, "event " + std::to_string(id) + " belongs to no session, so no rule is known");
  KnownSession known;
  if (!find(tool, reader, *event->session, known)) return tool.status;
  if (!tool.asJson) {
    tool.out << printableLines(storyOf(tool, known).event(*event));
  } else if (known.life == nullptr) {
    printUnknown(tool, known);
  } else {
    printObjects(tool, known, *event);
  }
  return known.life == nullptr ? kRefused : kDone;
}

int explainOfSession(Tool& tool, SqlReader& reader, const ExplainOptions& options) {
  const PagedOutput pages(tool);
  KnownSession known;
  if (!find(tool, reader, *options.session, known)) return tool.status;
  const SessionStory story = storyOf(tool, known);
  const std::string category = categoryOf(options.missing);
  const std::string text = options.message ? story.message(*options.message) : story.summaries(category);
  if (text.empty()) {
    return tool.fail(kRefused, "session " + std::to_string(*options.session) + " has no message " +
                                   std::to_string(*options.message) + "; `twctl session " +
                                   std::to_string(*options.session) + "` lists them");
  }
  if (!tool.asJson) {
    tool.out << printableLines(text);
  } else if (known.life == nullptr) {
    printUnknown(tool, known);
  } else if (options.message) {
    for (const ValueMap* equal : known.life->equalTo(*options.message)) printLine(tool, *equal);
  } else if (const ReasonedLife::Walk* walk = known.life->walk(category)) {
    printWalk(tool, *walk);
  }
  return known.life == nullptr ? kRefused : kDone;
}

int explain(Tool& tool, const ExplainOptions& options) {
  const int wishes = (options.event ? 1 : 0) + (options.message ? 1 : 0) + (options.missing.empty() ? 0 : 1);
  if (wishes != 1 || options.event.has_value() == options.session.has_value()) {
    return tool.fail(kWrongUsage,
                     "explain: name an EVENT, or a --session with --message N or --missing KIND");
  }
  SqlReader reader;
  std::string path;
  if (!openStoreSql(tool, reader, path)) return tool.status;
  return options.event ? explainEvent(tool, reader, *options.event) : explainOfSession(tool, reader, options);
}

}  // namespace

void addSessionCommands(CLI::App& app, Tool& tool) {
  CLI::App& one = addCommand(app, tool, "session", "Tells what happened in one session, and why");
  one.footer(
      "ID is the first column of `twctl sessions`. The reasons are those of the daemon's own code: the\n"
      "session's requests are taken from the journal, as `twctl record` does, and played to it again. Where\n"
      "the journal no longer has them, only what the store knows is told. To keep them for a week:\n"
      "  twctl defaults write com.orvane.tonewerk.store journal_days 7");
  const auto id = std::make_shared<std::int64_t>();
  one.add_option("ID", *id, "The session")->required()->type_name("N")->check(problemWithCount);
  one.callback([&tool, id] { session(tool, *id); });

  CLI::App& why = addCommand(app, tool, "explain", "Tells which rule made an event, or withheld one");
  why.footer(
      "EVENT is the id of the store's view event, which `twctl session` and `twctl sql` show.\n"
      "  twctl explain 120\n"
      "  twctl explain --session 41 --message 3\n"
      "  twctl explain --session 41 --missing volume\n"
      "The exit status is 1 when the journal no longer has the session's requests.");
  const auto options = std::make_shared<ExplainOptions>();
  why.add_option("EVENT", options->event, "The event")->type_name("N")->check(problemWithCount);
  why.add_option("--session", options->session, "The session of a message, or of a summary that is missing")
      ->type_name("ID")
      ->check(problemWithCount);
  why.add_option("--message", options->message, "The number of a message, which `twctl session` shows")
      ->type_name("N")
      ->check(problemWithCount);
  why.add_option("--missing", options->missing, "Why there is no such summary")
      ->type_name("volume|input|gather")
      ->check(problemWithMissing);
  why.callback([&tool, options] { tool.status = explain(tool, *options); });
}

}  // namespace tonewerk
