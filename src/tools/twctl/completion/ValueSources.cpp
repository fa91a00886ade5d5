// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/completion/ValueSources.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <filesystem>
#include <set>
#include <sstream>
#include <string_view>
#include <utility>

#include "platform/Log.h"
#include "platform/PreferenceSchema.h"
#include "platform/linux/channels/LinuxChanmeter.h"
#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "platform/linux/store/StoreFile.h"
#include "protocol/EventTexts.h"
#include "protocol/FeatureTable.h"
#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"
#include "tools/twctl/ToolLog.h"
#include "tools/twctl/input/PreferenceCheck.h"
#include "tools/twctl/input/ValueArguments.h"
#include "tools/twctl/sessions/StoredSessions.h"
#include "tools/twctl/sql/SqlReader.h"
#include "tools/twctl/sql/StoreNames.h"
#include "values/Date.h"

namespace tonewerk {
namespace {

using Candidates = std::vector<Candidate>;

constexpr std::int64_t kMostSessions = 20;  // that are offered, the newest

// The tool's directories and sockets, with its output thrown away.
class QuietTool {
 public:
  explicit QuietTool(const Tool& tool, bool systemWide) : tool_{none_, none_, tool.json} {
    tool_.systemWide = systemWide;
  }
  Tool& operator*() { return tool_; }
  Tool* operator->() { return &tool_; }

 private:
  std::ostringstream none_;
  Tool tool_;
};

// What a source may use.
struct Question {
  const CompletionPoint& point;
  const Tool& tool;

  QuietTool quiet() const { return QuietTool(tool, tool.systemWide || point.systemWide); }
  std::string argument(std::size_t place) const {
    return place < point.arguments.size() ? point.arguments[place] : std::string();
  }
};

Candidates plain(std::initializer_list<std::string_view> words) {
  Candidates candidates;
  for (const std::string_view word : words) candidates.push_back({std::string(word)});
  return candidates;
}

Candidates plain(const std::vector<std::string>& words) {
  Candidates candidates;
  for (const std::string& word : words) candidates.push_back({word});
  return candidates;
}

std::vector<std::string> serviceNames() {
  const std::string unknown = TWReportingUtilityGenerateServiceNameFromServiceType(kServiceUnknown);
  std::vector<std::string> names;
  for (AudioServiceType type = 0;; ++type) {
    std::string name = TWReportingUtilityGenerateServiceNameFromServiceType(type);
    if (name == unknown) return names;
    names.push_back(std::move(name));
  }
}

// --- what is known without looking anything up ---

Candidates times(const Question& /*question*/) {
  return {{"10m", "ten minutes ago"},   {"1h", "an hour ago"},       {"1d", "a day ago"},
          {"7d", "a week ago"},         {"today", "since midnight"}, {"yesterday", "the day before"},
          {"now", "the present moment"}};
}

Candidates seconds(const Question& /*question*/) { return plain({"1", "5", "60"}); }
Candidates counts(const Question& /*question*/) { return plain({"10", "100", "1000"}); }
Candidates speeds(const Question& /*question*/) {
  return {{"1", "as recorded"}, {"2", "twice as fast"}, {"10"}, {"max", "without pauses"}};
}

// Categories with a domain are many, so only those that begin with what is typed.
Candidates categories(const Question& question) {
  return plain(question.point.word.empty() ? baseCategoryNames() : categoryNames());
}

Candidates types(const Question& /*question*/) { return plain(typeNames()); }
Candidates services(const Question& /*question*/) { return plain(serviceNames()); }

Candidates rtcNames(const Question& /*question*/) {
  Candidates candidates;
  for (const std::string& name : serviceNames()) candidates.push_back({name + "_session"});
  return candidates;
}

Candidates powerEvents(const Question& /*question*/) {
  return plain(
      {"Flumen_Haptics_EngineOnDuration", "Flumen_Haptics_ClientStatus", "LeakedHapticsSessionInfo"});
}

// Names such as com.orvane.tonewerk.Volume.Summary, one part at a time.
Candidates eventNames(const Question& question) {
  static const std::string kRoot = "com.orvane.";
  const std::string& word = question.point.word;
  const auto parts = std::count(word.begin(), word.end(), '.');
  const std::string begin = word.substr(0, word.rfind('.') + 1);
  Candidates candidates;
  if (parts <= 2) {
    if (parts < 2 || begin == kRoot) {
      candidates.push_back({kRoot + "tonewerk."});
      for (const std::string& service : serviceNames()) candidates.push_back({kRoot + service + "."});
    }
  } else if (!begin.starts_with(kRoot)) {
    return candidates;
  } else if (parts == 3) {
    const bool isBegun = begin.size() < word.size();
    for (const std::string& name : isBegun ? categoryNames() : baseCategoryNames())
      candidates.push_back({begin + name + "."});
  } else {
    for (const std::string& name : typeNames()) candidates.push_back({begin + name});
  }
  return candidates;
}

Candidates channelGroups(const Question& /*question*/) {
  return plain({"OrvaneAE2MCA", "Speaker", "StateTransitionTimes_ms", "Rx", "Tx", "pdm", "Haptics", "Nodes"});
}

Candidates knownNotifications(const Question& /*question*/) {
  Candidates candidates{{std::string(TWReportingNotificationName), "the daemon reads its preferences again"},
                        {"com.orvane.tonewerk.dropped-whirlcap"}};
  for (const ValueMap::Entry& feature : featureTable()) {
    if (const ValueMap* facts = feature.value.asMap())
      candidates.push_back({facts->text(kFeatureNotification)});
  }
  return candidates;
}

Candidates preferenceDomainsToRead(const Question& /*question*/) {
  Candidates candidates = plain(preferenceDomains());
  candidates.push_back({std::string(kDeviceFacts), "what the device is; read only"});
  return candidates;
}

Candidates preferenceDomainsToWrite(const Question& /*question*/) { return plain(preferenceDomains()); }

Candidates preferenceKeys(const Question& question) {
  Candidates candidates;
  const std::string domain = question.argument(0);
  for (const std::string& key : knownKeys(domain)) {
    const Preference* preference = findPreference(domain, key);
    candidates.push_back({key, preference == nullptr ? "" : std::string(preference->meaning)});
  }
  return candidates;
}

Candidates preferenceValues(const Question& question) {
  const Preference* preference = findPreference(question.argument(0), question.argument(1));
  if (preference == nullptr) return {};
  const bool isBoolean =
      preference->type == PreferenceType::kBoolean || preference->type == PreferenceType::kAny;
  return isBoolean ? plain({"true", "false"}) : Candidates();
}

// --- what is looked up ---

Candidates runningSessions(const Question& question) {
  QuietTool tool = question.quiet();
  DaemonCalls daemon(*tool);
  std::optional<Value> answer;
  Candidates candidates;
  if (!daemon.connect(DaemonCalls::Role::kOnlooker) ||
      !daemon.call(requests::kGetAllReporters.name, {}, answer) || !answer || answer->asArray() == nullptr)
    return candidates;
  for (const Value& identifier : *answer->asArray()) candidates.push_back({identifier.text()});
  return candidates;
}

// Runs `use` with the store, if there is one.
void withStore(const Question& question, const std::function<void(SqlReader& reader)>& use) {
  QuietTool tool = question.quiet();
  SqlReader reader;
  if (reader.open(storeFileIn(tool->directories().state).path).empty()) use(reader);
}

Candidates firstColumn(const Question& question, const std::string& sql) {
  Candidates candidates;
  withStore(question, [&](SqlReader& reader) {
    for (const std::vector<SqlValue>& row : reader.rows(sql)) {
      if (const auto* text = std::get_if<std::string>(&row.at(0))) candidates.push_back({*text});
    }
  });
  return candidates;
}

Candidates storedSessions(const Question& question) {
  Candidates candidates;
  withStore(question, [&](SqlReader& reader) {
    SessionFilter filter;
    filter.limit = kMostSessions;
    std::string problem;
    const auto add = [&](const StoredSession& session) {
      candidates.push_back({std::to_string(session.id), session.service.value_or("unknown") + ", " +
                                                            session.application.value_or("unknown") + ", " +
                                                            textOf(Date{session.startedAt})});
    };
    if (!readSessions(reader, filter, problem, add)) candidates.clear();
  });
  return candidates;
}

Candidates storedReporters(const Question& question) {
  Candidates candidates = runningSessions(question);
  withStore(question, [&](SqlReader& reader) {
    SessionFilter filter;
    filter.limit = kMostSessions;
    std::string problem;
    const auto add = [&](const StoredSession& session) {
      candidates.push_back({std::to_string(session.reporterID), session.application.value_or("unknown")});
    };
    if (!readSessions(reader, filter, problem, add)) candidates.clear();
  });
  return candidates;
}

Candidates storedApplications(const Question& question) {
  return firstColumn(question, "SELECT DISTINCT application FROM session WHERE application IS NOT NULL");
}

Candidates storedDevices(const Question& question) {
  return firstColumn(question,
                     "SELECT device FROM volume_stretch WHERE device IS NOT NULL UNION SELECT device FROM "
                     "input_stretch WHERE device IS NOT NULL");
}

Candidates storedGlitches(const Question& question) {
  return firstColumn(
      question,
      "SELECT glitch_id FROM glitch WHERE glitch_id IS NOT NULL GROUP BY glitch_id ORDER BY max(at) "
      "DESC LIMIT 20");
}

Candidates storedViews(const Question& question) {
  Candidates candidates;
  withStore(question, [&](SqlReader& reader) {
    for (const std::string& name : readableNamesOf(reader)) candidates.push_back({name});
  });
  return candidates;
}

Candidates drivers(const Question& question) {
  QuietTool tool = question.quiet();
  ToolLog log(*tool);
  const LogCategory category(log, "com.orvane.tonewerk", "twctl");
  LinuxChanmeter chanmeter(tool->directories().runtime + "/channels", category);
  std::optional<ChanmeterError> error;
  const Chanmeter::Channels channels = chanmeter.copyChannelsInGroup(std::nullopt, std::nullopt, error);
  if (!channels) return {};
  Chanmeter::Channels subscribed;
  const Chanmeter::Subscription subscription = chanmeter.createSubscription(channels, subscribed, error);
  const Chanmeter::Samples samples =
      subscription ? chanmeter.createSamples(subscription, subscribed, error) : nullptr;
  if (!samples) return {};
  std::set<std::string> names;
  chanmeter.iterate(*samples, [&names](const ChanmeterSample& sample) {
    names.emplace(sample.driverName().value_or(""));
    return 0;
  });
  return plain(std::vector<std::string>(names.begin(), names.end()));
}

Candidates postedNotifications(const Question& question) {
  QuietTool tool = question.quiet();
  std::error_code error;
  Candidates candidates;
  std::filesystem::directory_iterator entry(tool->directories().runtime + "/notifications", error);
  for (; !error && entry != std::filesystem::directory_iterator(); entry.increment(error)) {
    const std::string name = entry->path().filename();
    std::error_code ignored;
    if (!name.starts_with('.') && entry->is_regular_file(ignored)) candidates.push_back({name});
  }
  return candidates;
}

Candidates diagnostics(const Question& question, DiagnosticKind kind) {
  QuietTool tool = question.quiet();
  Candidates candidates;
  for (const auto& entry : DiagnosticsDirectory(tool->directories().state).list(kind))
    candidates.push_back({entry.name});
  return candidates;
}

Candidates captures(const Question& question) { return diagnostics(question, DiagnosticKind::kCapture); }
Candidates drafts(const Question& question) { return diagnostics(question, DiagnosticKind::kIssueDraft); }
Candidates whirlcaps(const Question& question) { return diagnostics(question, DiagnosticKind::kWhirlcap); }

// What an option, or the argument of a command, can be. The first line that fits counts; an empty command
// fits all.
struct Entry {
  std::string_view command;
  std::string_view name;
  Candidates (*known)(const Question& question);
  Candidates (*lookup)(const Question& question) = nullptr;
  ShellPart shell = ShellPart::kNone;
};

constexpr std::array kEntries = {
    Entry{"record", "--session", nullptr, storedReporters},
    Entry{"rtc", "--name", rtcNames},
    Entry{"power", "--name", powerEvents},
    Entry{"", "--name", eventNames},
    Entry{"", "--session", nullptr, storedSessions},
    Entry{"", "--id", nullptr, runningSessions},
    Entry{"", "--category", categories},
    Entry{"", "--type", types},
    Entry{"", "--output", nullptr, nullptr, ShellPart::kFiles},
    Entry{"", "--speed", speeds},
    Entry{"", "--since", times},
    Entry{"", "--until", times},
    Entry{"", "--interval", seconds},
    Entry{"", "--watch", seconds},
    Entry{"", "--limit", counts},
    Entry{"", "--count", counts},
    Entry{"", "--app", nullptr, storedApplications},
    Entry{"", "--device", nullptr, storedDevices},
    Entry{"", "--service", services},
    Entry{"", "--driver", nullptr, drivers},
    Entry{"", "--group", channelGroups},
    Entry{"glitches", "--why", nullptr, storedGlitches},
    Entry{"validate", "ID", nullptr, runningSessions},
    Entry{"session", "ID", nullptr, storedSessions},
    Entry{"replay", "FILE", nullptr, nullptr, ShellPart::kRecordings},
    Entry{"", "FILE", nullptr, nullptr, ShellPart::kFiles},
    Entry{"export", "VIEW", nullptr, storedViews},
    Entry{"defaults write", "DOMAIN", preferenceDomainsToWrite},
    Entry{"defaults delete", "DOMAIN", preferenceDomainsToWrite},
    Entry{"", "DOMAIN", preferenceDomainsToRead},
    Entry{"", "KEY", preferenceKeys},
    Entry{"defaults write", "VALUE", preferenceValues},
    Entry{"notify post", "NAME", knownNotifications, postedNotifications},
    Entry{"notify get", "NAME", knownNotifications, postedNotifications},
    Entry{"captures show", "ID", nullptr, captures},
    Entry{"captures delete", "ID", nullptr, captures},
    Entry{"drafts show", "ID", nullptr, drafts},
    Entry{"drafts delete", "ID", nullptr, drafts},
    Entry{"whirlcaps show", "ID", nullptr, whirlcaps},
    Entry{"whirlcaps delete", "ID", nullptr, whirlcaps},
};

const Entry* entryFor(const CompletionPoint& point) {
  if (point.option == nullptr) return nullptr;
  for (const Entry& entry : kEntries) {
    const bool isOption = entry.name.starts_with('-');
    const bool isNamed = isOption ? point.option->check_name(std::string(entry.name))
                                  : point.option->get_positional() && !point.option->nonpositional() &&
                                        point.option->get_name(true) == entry.name;
    if (isNamed && (entry.command.empty() || entry.command == point.path)) return &entry;
  }
  return nullptr;
}

// Those that fit the word, whole words again.
Candidates fitting(const CompletionPoint& point, Candidates candidates) {
  std::set<std::string> seen;
  std::erase_if(candidates, [&](const Candidate& candidate) {
    return !candidate.word.starts_with(point.word) || !isOfferable(candidate.word) ||
           !seen.insert(candidate.word).second;
  });
  for (Candidate& candidate : candidates) candidate.word.insert(0, point.before);
  return candidates;
}

}  // namespace

ValueSources valueSourcesFor(const CompletionPoint& point, const Tool& tool) {
  ValueSources sources;
  const Entry* entry = entryFor(point);
  if (entry == nullptr) return sources;
  sources.shell = entry->shell;
  if (entry->known != nullptr) sources.known = fitting(point, entry->known({point, tool}));
  if (entry->lookup != nullptr)
    sources.lookup = [entry, point, &tool] { return fitting(point, entry->lookup({point, tool})); };
  return sources;
}

}  // namespace tonewerk
