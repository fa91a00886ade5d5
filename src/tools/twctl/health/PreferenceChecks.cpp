// SPDX-License-Identifier: Apache-2.0
//
// The checks of preferences, facts and endpoints.
#include <algorithm>
#include <filesystem>
#include <string_view>
#include <system_error>

#include "platform/PreferenceSchema.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/otlp/LinkReportBackends.h"
#include "platform/linux/otlp/LinuxLinkReport.h"
#include "platform/linux/preferences/TomlText.h"
#include "platform/linux/store/StoreMetricon.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/health/Checkup.h"
#include "tools/twctl/health/ShellWord.h"
#include "tools/twctl/input/PreferenceCheck.h"
#include "values/ClosestName.h"

namespace tonewerk {
namespace {

constexpr std::string_view kEnding = ".toml";

// What is wrong in a file.
std::string inFile(const std::string& path, const std::string& problem) { return path + ": " + problem; }

// Reads a file, and adds why it cannot be read. None then, and when there is none.
std::optional<ValueMap> readToml(const Checkup& checkup, const std::string& path, Findings& findings) {
  std::string text;
  struct stat status {};
  const std::error_code error = readFileBytes(path, text, &status);
  if (error == std::errc::no_such_file_or_directory) return std::nullopt;
  if (error) {
    findings.couldNotSee(path + ": " + error.message());
    return std::nullopt;
  }
  // Root reads what the daemon cannot.
  const bool isOwn = status.st_uid == checkup.daemonUser();
  const bool isReadable = (status.st_mode & (isOwn ? S_IRUSR : S_IRGRP | S_IROTH)) != 0;
  if (!isReadable && checkup.daemonUser() != 0)
    findings.add("unreadable-file", path + " cannot be read by the daemon's user",
                 "sudo chmod " + std::string(isOwn ? "u+r " : "o+r ") + shellWord(path));
  std::string problem;
  std::optional<ValueMap> values = parseToml(text, problem);
  if (!values) findings.add("broken-file", path + ":" + problem, "mend the line in " + path);
  return values;
}

// The value as it is typed for `twctl defaults write`.
std::string typed(const Value& value) {
  const bool* boolean = value.asBoolean();
  return shellWord(boolean == nullptr ? value.text() : (*boolean ? "true" : "false"));
}

class PreferenceFiles {
 public:
  PreferenceFiles(const Checkup& checkup, Findings& findings) : checkup_(checkup), findings_(findings) {}

  void check(const std::string& directory, bool isWritten) {
    std::error_code error;
    std::filesystem::directory_iterator entry(directory, error);
    if (error && error != std::errc::no_such_file_or_directory)
      return findings_.couldNotSee(directory + ": " + error.message());
    std::vector<std::string> names;
    for (const std::filesystem::directory_iterator end; !error && entry != end; entry.increment(error)) {
      const std::string name = entry->path().filename().string();
      if (name.ends_with(kEnding) && !name.starts_with('.')) names.push_back(name);
    }
    std::sort(names.begin(), names.end());
    for (const std::string& name : names)
      checkFile(std::filesystem::path(directory) / name, name.substr(0, name.size() - kEnding.size()),
                isWritten);
  }

 private:
  void checkFile(const std::string& path, const std::string& domain, bool isWritten) {
    const std::optional<ValueMap> values = readToml(checkup_, path, findings_);
    if (knownKeys(domain).empty()) {
      if (const auto meant = closestTo(domain, preferenceDomains()))
        findings_.add(
            "unknown-domain", path + " is not read; did you mean " + *meant + "?",
            "mv " + shellWord(path) + " " +
                shellWord(
                    std::filesystem::path(path).replace_filename(*meant + std::string(kEnding)).string()));
      return;
    }
    if (!values) return;
    const std::string remove = isWritten ? checkup_.twctl() + " defaults delete " + domain + " " : "";
    for (const ValueMap::Entry& entry : *values) {
      const std::string key = entry.key.string();
      for (const std::string& line : unknownKeys(domain, {{entry.key, entry.value}})) {
        findings_.add("unknown-key", inFile(path, line),
                      isWritten ? remove + shellWord(key) : mend(path, key));
      }
      for (const std::string& line : preferenceProblems(domain, key, entry.value))
        addWrong(path, domain, key, line, isWritten);
    }
  }

  static std::string mend(const std::string& path, const std::string& key) {
    return "edit or remove " + key + " in " + path;
  }

  void addWrong(const std::string& path, const std::string& domain, const std::string& key,
                const std::string& line, bool isWritten) {
    const Preference& known = *findPreference(domain, key);
    const bool isEndpoint =
        domain == LinuxLinkReport::kPreferenceDomain && key == LinuxLinkReport::kBackendsKey;
    const std::string defaults = checkup_.twctl() + " defaults";
    std::string remedy = mend(path, key);
    if (known.fallback && !known.fallback->asArray()) {
      remedy =
          defaults + " write " + domain + " " + key + " " + typed(*known.fallback) + ", or edit the file";
    } else if (isWritten) {  // delete leaves the files of the configuration alone
      remedy = defaults + " delete " + domain + " " + key + ", or edit the file";
    }
    findings_.add(isEndpoint && line.starts_with("backends: ") ? "wrong-endpoint" : "wrong-value",
                  path + ": " + line, remedy);
  }

  const Checkup& checkup_;
  Findings& findings_;
};

// What counts for a key, of those values that the checks have accepted. `from` becomes its file.
std::optional<Value> effective(const Checkup& checkup, std::string_view domain, std::string_view key,
                               std::string& from) {
  std::optional<Value> value;
  for (const std::string& directory : {checkup.directories.configuration, checkup.directories.state}) {
    std::string text;
    std::string problem;
    const std::string path = directory + "/preferences/" + std::string(domain) + std::string(kEnding);
    if (readFileBytes(path, text, nullptr)) continue;
    const std::optional<ValueMap> values = parseToml(text, problem);
    const Value* found = values ? values->find(key) : nullptr;
    if (found == nullptr) continue;
    value = *found;
    from = path;
  }
  const Preference& known = *findPreference(domain, key);
  return value && !problemWith(known, *value) ? value : std::nullopt;
}

struct Address {
  std::string host;
  std::string port;
};

// Of "https://host:4318/path"; the backends have checked its form.
Address addressOf(const std::string& url) {
  const std::size_t begin = url.find("://") + 3;
  const std::string authority = url.substr(begin, url.find('/', begin) - begin);
  const std::size_t bracket = authority.find(']');
  const std::size_t colon = authority.find(':', bracket == std::string::npos ? 0 : bracket);
  Address address{authority.substr(0, colon), url.starts_with("https") ? "443" : "80"};
  if (colon != std::string::npos) address.port = authority.substr(colon + 1);
  if (bracket != std::string::npos) address.host = authority.substr(1, bracket - 1);
  return address;
}

}  // namespace

void checkPreferences(const Checkup& checkup, Findings& findings) {
  PreferenceFiles files(checkup, findings);
  files.check(checkup.directories.configuration + "/preferences", false);
  files.check(checkup.directories.state + "/preferences", true);
  std::string from;
  const auto consumers =
      effective(checkup, StoreMetricon::kPreferenceDomain, StoreMetricon::kConsumersKey, from);
  if (!consumers) return;
  const ValueArray& asked = *consumers->asArray();
  const bool isAnythingAsked = std::any_of(asked.begin(), asked.end(), [](const Value& consumer) {
    const Value* events = consumer.asMap()->find("events");
    return events != nullptr && events->asArray() != nullptr && !events->asArray()->empty();
  });
  if (isAnythingAsked) return;
  const bool isWritten = from.starts_with(checkup.directories.state + "/");
  findings.add("no-consumer", "consumers of com.orvane.metricon asks for no event",
               isWritten ? checkup.twctl() + " defaults delete com.orvane.metricon consumers"
                         : "edit or remove consumers in " + from);
}

void checkFacts(const Checkup& checkup, Findings& findings) {
  const std::string path = checkup.directories.configuration + "/device-facts.toml";
  const std::optional<ValueMap> facts = readToml(checkup, path, findings);
  const std::string edit = "edit " + path;
  bool isInternal = false;
  for (const ValueMap::Entry& entry : facts.value_or(ValueMap())) {
    for (const std::string& line : unknownKeys(kDeviceFacts, {{entry.key, entry.value}}))
      findings.add("wrong-fact", inFile(path, line), edit);
    const Preference* known = findPreference(kDeviceFacts, entry.key.view());
    if (known == nullptr) continue;
    const std::optional<std::string> problem = problemWith(*known, entry.value);
    if (problem) findings.add("wrong-fact", inFile(path, *problem), edit);
    if (entry.key.view() == "InternalBuild" && !problem) isInternal = *entry.value.asBoolean();
  }
  const Value* running = checkup.daemon.daemon.find(kWatchKeyInternalBuild);
  if (running != nullptr && running->boolean() != isInternal)
    findings.add("old-fact",
                 std::string("InternalBuild is ") + (isInternal ? "true" : "false") +
                     " now, and was not when the daemon started",
                 checkup.restart());
}

void checkEndpoints(const Checkup& checkup, Findings& findings) {
  std::string from;
  const auto value =
      effective(checkup, LinuxLinkReport::kPreferenceDomain, LinuxLinkReport::kBackendsKey, from);
  for (const LinkReportBackends::Endpoint& endpoint : LinkReportBackends::from(value).endpoints) {
    const Address address = addressOf(endpoint.url);
    const std::string problem = checkup.around.reach(address.host, address.port);
    if (!problem.empty())
      findings.add("unreachable-endpoint", endpoint.base + ": " + problem,
                   "curl -v " + shellWord(endpoint.base));
  }
  for (const ValueMap& endpoint : mapsIn(checkup.daemon.endpoints.value_or(ValueArray()))) {
    const std::string problem = endpoint.text(kWatchKeyProblem);
    if (!problem.empty())
      findings.add("failing-endpoint", endpoint.text(kWatchKeyName) + ": " + problem,
                   "curl -v " + shellWord(endpoint.text(kWatchKeyName)));
  }
}

}  // namespace tonewerk
