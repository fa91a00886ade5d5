// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SessionStory.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <string_view>

#include "tools/recording/ReasonKeys.h"
#include "tools/twctl/show/LocalTime.h"
#include "tools/twctl/show/TopFrame.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// What the core has added to a message, and its time, which the line begins with.
constexpr std::array<std::string_view, 4> kHidden{"twreporting_timestamp", "audiotag",
                                                  "HostApplicationDisplayID", "invalid_timestamp"};
// The issues tell the verdict on an overload.
constexpr std::string_view kHiddenBegin = "glitch_";
constexpr std::size_t kIndent = 2;

double rounded(double number) {
  constexpr double kPerUnit = 1000.0;
  return std::round(number * kPerUnit) / kPerUnit;
}

// "3", "0.5"
std::string shortNumber(double number) {
  const double value = rounded(number);
  const auto whole = static_cast<std::int64_t>(value);
  return static_cast<double>(whole) == value ? std::to_string(whole) : textOf(value);
}

std::string secondsText(double seconds) { return shortNumber(seconds) + " s"; }

std::string countOf(std::int64_t count, const std::string& one, const std::string& more) {
  return std::to_string(count) + " " + (count == 1 ? one : more);
}

// "2", "2 and 3", "2, 3 and 5"
std::string listOf(const std::vector<std::string>& words) {
  std::string text;
  for (std::size_t at = 0; at < words.size(); ++at) {
    if (at > 0) text += at + 1 == words.size() ? " and " : ", ";
    text += words[at];
  }
  return text;
}

// "message 2", "messages 2 and 3", "messages 2 to 900 and 903"
std::string messagesText(const ValueArray& numbers) {
  constexpr std::int64_t kFewestOfRange = 3;
  std::vector<std::string> words;
  for (std::size_t at = 0; at < numbers.size();) {
    const std::int64_t first = numbers[at].integer();
    std::int64_t last = first;
    for (++at; at < numbers.size() && numbers[at].integer() == last + 1; ++at) ++last;
    if (last - first + 1 >= kFewestOfRange) {
      words.push_back(std::to_string(first) + " to " + std::to_string(last));
    } else {
      for (std::int64_t number = first; number <= last; ++number) words.push_back(std::to_string(number));
    }
  }
  return (numbers.size() == 1 ? "message " : "messages ") + listOf(words);
}

// What a key says that runs: "output" of "session_output_running".
std::string whatRuns(const ReasonedLife::Walk& walk) {
  return walk.about.text(reasons::kKey).find("input") == std::string::npos ? "output" : "input";
}

// "cause: late, culprit org.example.Studio (studio, 4711), at least 3.07 ms beyond the deadline"
std::string verdictText(const GlitchVerdict& verdict) {
  if (!verdict.sharedCause()) return "whose it was could not be told";
  const std::string waiting = "waiting for another";
  const bool isInnocent = verdict.cause == waiting && verdict.firstCause && verdict.firstCause != waiting;
  std::string text = isInnocent ? "it waited for another, which was first in the chain: " : "cause: ";
  text += verdict.causeText() + ", culprit " + culpritOf(verdict);
  if (verdict.overMs) text += ", at least " + millisecondsText(*verdict.overMs) + " beyond the deadline";
  if (verdict.lostMs) text += ", " + millisecondsText(*verdict.lostMs) + " lost";
  return text;
}

std::string endingText(const StoredSession& session) {
  std::string ending = session.ending.value_or("");
  if (ending == "stopped") return "it was stopped";
  if (ending == "replaced") return "a new session of the same client replaced it";
  if (ending == "disconnected") return "its client had gone";
  if (ending == "interrupted") return "the daemon had gone";
  return ending;
}

// How the daemon makes messages that are no summaries of stretches.
std::string howMade(const StoredEventRow& event) {
  if (event.category == "Session_Generic" && event.type == "Summary") {
    return "The daemon makes one for each session when it stops: of all its messages, of when output or "
           "input "
           "ran, and of the device at that moment.";
  }
  if (event.category == "Chanmetering") {
    return "The daemon makes it when a session stops, of how a driver's counters changed since its start.";
  }
  if (event.type == "Summary")
    return "No stretch gave it when the session was played again: the replay has the preferences of now.";
  return "The daemon sends it to started sessions, because the system told it, or a new value of it.";
}

}  // namespace

std::string SessionStory::since(double time) const {
  const double seconds = rounded(time - session_.startedAt);
  return (seconds < 0 ? "" : "+") + secondsText(seconds);
}

void SessionStory::add(std::string& text, const std::string& paragraph, std::size_t indent) const {
  std::size_t length = 0;  // of the line so far
  std::size_t from = 0;
  while (from < paragraph.size()) {
    // A word with the spaces before it.
    std::size_t end = paragraph.find_first_not_of(' ', from);
    end = end == std::string::npos ? paragraph.size() : paragraph.find(' ', end);
    if (end == std::string::npos) end = paragraph.size();
    std::string word = paragraph.substr(from, end - from);
    std::size_t characters = utf8Characters(word);
    if (width_ && length > indent && length + characters > *width_) {
      word.erase(0, word.find_first_not_of(' '));
      characters = indent + utf8Characters(word);
      text.append("\n").append(indent, ' ');
      length = 0;
    }
    text += word;
    length += characters;
    from = end;
  }
  text += '\n';
}

void SessionStory::head(std::string& text) const {
  std::string line = "Session " + std::to_string(session_.id) + ": " +
                     session_.application.value_or("an unknown application") + " (process " +
                     session_.process.value_or("unknown") + ", user " + std::to_string(session_.user) +
                     ") for " + session_.service.value_or("an unknown service") + ", reporter " +
                     std::to_string(session_.reporterID) + ".";
  add(text, line);
  line = "It began at " + localTime(session_.startedAt);
  if (session_.endedAt) {
    line += " and ended at " + localTime(*session_.endedAt) + ", after " +
            runningTime(*session_.endedAt - session_.startedAt) + ": " + endingText(session_) + ".";
  } else {
    line += " and has not ended.";
  }
  add(text, line);
  if (!session_.messages) return;
  add(text, countOf(*session_.messages, "message", "messages") + ", " +
                std::to_string(session_.redundantMessages.value_or(0)) + " of them redundant; " +
                countOf(session_.overloads.value_or(0), "overload", "overloads") + "; " +
                secondsText(session_.activeSeconds.value_or(0.0)) + " active.");
}

std::string SessionStory::messageLine(const ValueMap& message) const {
  std::string line = std::to_string(message.integer(reasons::kNumber)) + "  " +
                     since(message.number(reasons::kAt)) + "  " + message.text(reasons::kCategory) + " " +
                     message.text(reasons::kType);
  if (message.boolean(reasons::kRedundant)) {
    const std::int64_t repeated = message.integer(reasons::kRepeats);
    return line + ": redundant, it repeats " +
           (repeated == 0 ? "a message of the session itself" : "message " + std::to_string(repeated)) +
           " in everything but its times";
  }
  if (!message.boolean(reasons::kKept)) line += " (not kept: its client's sessions had no room)";
  const Value* payload = message.find(reasons::kPayload);
  const ValueMap* map = payload == nullptr ? nullptr : payload->asMap();
  if (map == nullptr) return line + ", which the store does not have";
  if (message.boolean(reasons::kDerived) && message.contains(kMessageKeyEvent))
    line += ", event " + message.text(kMessageKeyEvent);
  std::string separator = ":";
  for (const ValueMap::Entry& entry : *map) {
    const std::string_view key = entry.key.view();
    if (std::find(kHidden.begin(), kHidden.end(), key) != kHidden.end() || key.starts_with(kHiddenBegin))
      continue;
    line += separator + " " + entry.key.string() + "=" + entry.value.text();
    separator.clear();
  }
  return line;
}

void SessionStory::messages(std::string& text, bool areDerived) const {
  for (const ValueMap& message : life_->messages) {
    // The stretches tell more of those summaries.
    const bool isOfStretch =
        message.text(reasons::kType) == "Summary" && life_->walk(message.text(reasons::kCategory)) != nullptr;
    if (message.boolean(reasons::kDerived) != areDerived || (areDerived && isOfStretch)) continue;
    // The replay stops a session that still runs, which makes messages that the daemon has not made yet.
    const bool isNotYet = areDerived && !session_.endedAt && !message.contains(kMessageKeyEvent);
    if (!isNotYet) add(text, std::string(kIndent, ' ') + messageLine(message), 2 * kIndent);
  }
  if (!areDerived) return;
  for (const StoredPayload& event : life_->onlyStored) {
    add(text,
        std::string(kIndent, ' ') + since(event.at) + "  " + event.category + " " + event.type + ", event " +
            std::to_string(event.event) +
            ": the session has it, but its replay does not, so the reasons may differ from what happened",
        2 * kIndent);
  }
}

std::string SessionStory::causeOf(const ReasonedLife::Walk& walk, const ValueMap& end) const {
  const std::string cause = end.text(reasons::kCause);
  const std::string message =
      end.contains(reasons::kNumber) ? " (message " + end.text(reasons::kNumber) + ")" : "";
  if (cause == reasons::kCauseStopped) return whatRuns(walk) + " stopped" + message;
  if (cause == reasons::kCauseLast) return "the client said how long the session was" + message;
  const std::string key = end.text(reasons::kKey);
  if (!end.contains(reasons::kAfter)) {
    return whatRuns(walk) + " was started again without " + key + message;
  }
  if (!end.contains(reasons::kBefore)) return key + " became " + end.text(reasons::kAfter) + message;
  if (end.text(reasons::kBefore) == end.text(reasons::kAfter))
    return key + "=" + end.text(reasons::kAfter) + " came again" + message;
  return key + " changed from " + end.text(reasons::kBefore) + " to " + end.text(reasons::kAfter) + message;
}

std::string SessionStory::outcomeOf(const ReasonedLife::Walk& walk, const ValueMap& end) const {
  const std::string outcome = end.text(reasons::kOutcome);
  const std::string category = walk.about.text(reasons::kCategory);
  if (outcome == reasons::kOutcomeSummary) {
    const std::int64_t index = end.integer(reasons::kIndex);
    const auto event = records_.summaries.find({category, index});
    std::string known;
    if (event != records_.summaries.end()) known = ", event " + std::to_string(event->second);
    if (known.empty() && session_.endedAt) known = ", which the store does not have";
    const Value* messages = end.find(reasons::kMessages);
    const ValueArray* numbers = messages == nullptr ? nullptr : messages->asArray();
    const bool areKnown = numbers != nullptr && numbers->size() > 0;
    return category + " Summary " + std::to_string(index) + " of " + walk.end.text(reasons::kSummaries) +
           known + (areKnown ? "; made of " + messagesText(*numbers) : "");
  }
  std::string why = "why is not known";
  if (outcome == reasons::kOutcomeTooShort) {
    const double length = end.number(reasons::kUntil) - end.number(reasons::kFrom);
    why = secondsText(length) + " is not longer than " + secondsText(walk.about.number(reasons::kMinimum));
  } else if (outcome == reasons::kOutcomeNoBegin) {
    why = "no message that counts says when it began";
  } else if (outcome == reasons::kOutcomeNoEnd) {
    why = "the message that ended it has no time";
  } else if (outcome == reasons::kOutcomeNoApplication) {
    why = "the application is not known";
  } else if (outcome == reasons::kOutcomeNoVolume) {
    why = "no message before its end said the volume";
  } else if (outcome == reasons::kOutcomeNotInGather) {
    why = "no message before its end said whether it was in a Gather session";
  }
  return "no summary: " + why;
}

void SessionStory::step(std::string& text, const ReasonedLife::Walk& walk, const ValueMap& step) const {
  const std::string what = step.text(reasons::kWhat);
  const std::string message =
      step.contains(reasons::kNumber) ? "message " + step.text(reasons::kNumber) : std::string("a message");
  std::string line(kIndent, ' ');
  if (what == reasons::kRapid) {
    const std::string into =
        step.contains(reasons::kInto) ? "message " + step.text(reasons::kInto) : std::string("another one");
    const std::string pause = secondsText(step.number(reasons::kPause));
    const std::string maximum = secondsText(step.number(reasons::kMaximum));
    line += step.boolean(reasons::kMerged)
                ? message + " was merged into " + into + ": " + pause + " after it is less than " + maximum
                : message + " was not merged into " + into + ": " + pause + " after it is not less than " +
                      maximum;
  } else if (what == reasons::kStretch) {
    const std::string at = step.contains(reasons::kAt) ? since(step.number(reasons::kAt)) + "  " : "";
    line += at + whatRuns(walk) + " began (" + message + ")";
    if (step.contains(reasons::kCondition)) {
      line += "; that begins no stretch, because the message does not say " + step.text(reasons::kCondition) +
              "=1";
    }
  } else {
    if (step.contains(reasons::kFrom) && step.contains(reasons::kUntil)) {
      const double from = step.number(reasons::kFrom);
      const double until = step.number(reasons::kUntil);
      line += since(from) + " to " + since(until) + ", " + secondsText(until - from) + "  ";
    } else if (step.contains(reasons::kUntil)) {
      line += "until " + since(step.number(reasons::kUntil)) + "  ";
    }
    line += causeOf(walk, step) + " -> " + outcomeOf(walk, step);
  }
  add(text, line, 2 * kIndent);
}

void SessionStory::withheldOrMade(std::string& text, const ReasonedLife::Walk& walk) const {
  const std::string runs = whatRuns(walk);
  const std::string count = walk.end.text(reasons::kSummaries);
  add(text, walk.about.text(reasons::kCategory) + " summaries: " + (count.empty() ? "0" : count) +
                ". A stretch of " + runs + " must be longer than " +
                secondsText(walk.about.number(reasons::kMinimum)) + ".");
  if (walk.about.contains(reasons::kSince)) {
    add(text,
        std::string(kIndent, ' ') + since(walk.about.number(reasons::kSince)) + "  " + runs +
            " runs before the first message, as the latest values of the session say; this is their time",
        2 * kIndent);
  }
  for (const ValueMap& step : walk.steps) this->step(text, walk, step);
  const bool hasStretch = std::any_of(walk.steps.begin(), walk.steps.end(), [](const ValueMap& step) {
    return step.text(reasons::kWhat) != reasons::kRapid;
  });
  if (walk.end.contains(reasons::kRunsSince)) {
    add(text,
        std::string(kIndent, ' ') + since(walk.end.number(reasons::kRunsSince)) + "  a stretch of " + runs +
            " began that nothing ended -> no summary: it has no length",
        2 * kIndent);
  } else if (!hasStretch) {
    add(text,
        std::string(kIndent, ' ') + "none: no message said that " + runs + " began (" +
            walk.about.text(reasons::kKey) + ")",
        2 * kIndent);
  }
}

void SessionStory::issues(std::string& text) const {
  if (records_.issues.empty()) return;
  text += "\nIssues\n";
  for (const SessionRecords::Issue& issue : records_.issues) {
    std::string line(kIndent, ' ');
    line += since(issue.at) + "  " + issue.kind;
    if (issue.node) line += " at " + *issue.node;
    if (issue.seconds) line += ", " + secondsText(*issue.seconds) + " of silence";
    if (issue.frames) line += ", buffer of " + countOf(*issue.frames, "frame", "frames");
    const std::string event = std::to_string(issue.event);
    if (issue.verdict) line += "; " + verdictText(*issue.verdict);
    line += " (event " + event;
    if (issue.verdict) line += "; `twctl glitches --why " + event + "` tells more";
    add(text, line + ")", 2 * kIndent);
  }
}

void SessionStory::unknownReasons(std::string& text) const {
  add(text, "The reasons are not known: " + whyNot_ + ".");
}

void SessionStory::knownToTheStore(std::string& text) const {
  text += '\n';
  unknownReasons(text);
  add(text, "This is what the store knows.");
  text += "\nEvents in the store\n";
  for (const SessionRecords::Kind& kind : records_.kinds) {
    std::string line(kIndent, ' ');
    line += std::to_string(kind.count) + "  " + kind.category + " " + kind.type;
    add(text, line + (kind.source == "derived" ? " (derived)" : ""), 2 * kIndent);
  }
  if (records_.kinds.empty()) text += "  none\n";
  if (records_.stretches.empty()) return;
  text += "\nStretches\n";
  for (const SessionRecords::Stretch& stretch : records_.stretches) {
    std::string line(kIndent, ' ');
    if (stretch.from && stretch.until) line += since(*stretch.from) + " to " + since(*stretch.until) + ", ";
    line += secondsText(stretch.seconds) + "  " + stretch.category;
    if (stretch.device) line += " on " + *stretch.device;
    if (stretch.volume) line += " at volume " + textOf(*stretch.volume);
    add(text, line + " (event " + std::to_string(stretch.event) + ")", 2 * kIndent);
  }
}

std::string SessionStory::whole() const {
  std::string text;
  head(text);
  if (life_ == nullptr) {
    knownToTheStore(text);
  } else {
    std::string sent;
    messages(sent, false);
    text += "\nMessages, by the seconds since it began\n" + (sent.empty() ? "  none\n" : sent);
    std::string derived;
    messages(derived, true);
    if (!derived.empty()) text += "\nMade by the daemon\n" + derived;
    text += session_.endedAt ? "\n" : "\nIf it stopped now:\n";
    for (const ReasonedLife::Walk& walk : life_->walks) withheldOrMade(text, walk);
    if (life_->walks.empty()) text += "No producer looked for stretches.\n";
  }
  issues(text);
  text += '\n';
  add(text, "What was forwarded of it is not known: the store does not record sendings by session.");
  return text;
}

std::string SessionStory::repeatedBy(std::int64_t number) const {
  std::vector<Value> repeats;
  for (const ValueMap& message : life_->messages) {
    if (message.boolean(reasons::kRedundant) && message.integer(reasons::kRepeats) == number)
      repeats.emplace_back(message.integer(reasons::kNumber));
  }
  if (repeats.empty()) return "No later message repeated it.";
  const bool isOne = repeats.size() == 1;
  std::string text = messagesText(ValueArray(std::move(repeats)));
  text.front() = 'M';
  return text + " repeated it and " + (isOne ? "was" : "were") + " not recorded.";
}

std::string SessionStory::message(std::int64_t number) const {
  std::string text;
  if (life_ == nullptr) {
    unknownReasons(text);
    return text;
  }
  const ValueMap* found = life_->message(number);
  if (found == nullptr) return text;
  add(text, "Message " + messageLine(*found) + ".", kIndent);
  if (!found->boolean(reasons::kRedundant)) {
    add(text, repeatedBy(number));
  } else if (const ValueMap* repeated = life_->message(found->integer(reasons::kRepeats))) {
    add(text, "Message " + messageLine(*repeated) + ".", kIndent);
  }
  return text;
}

std::string SessionStory::summaries(const std::string& category) const {
  std::string text;
  if (life_ == nullptr) {
    unknownReasons(text);
    return text;
  }
  if (const ReasonedLife::Walk* walk = life_->walk(category)) {
    withheldOrMade(text, *walk);
  } else {
    add(text, "No producer looked for " + category +
                  " summaries: the session was never started, or had no "
                  "messages when it stopped.");
  }
  return text;
}

std::string SessionStory::event(const StoredEventRow& event) const {
  std::string text;
  add(text, "Event " + std::to_string(event.id) + ": " + event.category + " " + event.type + " of session " +
                std::to_string(session_.id) + ", recorded at " + localTime(event.at) + ", " +
                (event.source == "derived" ? "made by the daemon" : "sent by a client") + ".");
  if (life_ == nullptr) {
    unknownReasons(text);
    return text;
  }
  const ValueMap* end = event.isSummary() ? life_->summaryEnd(event.category, *event.summary) : nullptr;
  if (end != nullptr) {
    const ReasonedLife::Walk& walk = *life_->walk(event.category);
    add(text, "A stretch of " + whatRuns(walk) + " gave it, because it was longer than " +
                  secondsText(walk.about.number(reasons::kMinimum)) + ":");
    step(text, walk, *end);
    for (const Value& number : *end->find(reasons::kMessages)->asArray()) {
      if (const ValueMap* message = life_->message(number.integer()))
        add(text, std::string(kIndent, ' ') + messageLine(*message), 2 * kIndent);
    }
    return text;
  }
  if (event.source == "derived") {
    add(text, howMade(event));
    return text;
  }
  if (const ValueMap* message = life_->messageOf(event.id)) {
    add(text, "It is message " + messageLine(*message) + ".", kIndent);
    add(text, "It was recorded, because it repeated no earlier message of its category and type. " +
                  repeatedBy(message->integer(reasons::kNumber)));
    return text;
  }
  add(text,
      "Which of the session's messages it was is not known: the store does not have all of them, or not "
      "all of this one.");
  return text;
}

}  // namespace tonewerk
