// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/KernelSoundChannels.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <filesystem>
#include <memory>
#include <utility>

#include "platform/Log.h"
#include "platform/chanmeter/DutyCycles.h"
#include "platform/linux/channels/ChannelFailures.h"
#include "platform/linux/channels/PcmStatus.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

// The kernel's states in its order, and its word for a substream that is not open.
constexpr std::array<const char*, 10> kPcmStates{"OPEN",     "SETUP",  "PREPARED",  "RUNNING",      "XRUN",
                                                 "DRAINING", "PAUSED", "SUSPENDED", "DISCONNECTED", "closed"};

// The numbers between `prefix` and `suffix` in the names of a directory's entries: 3 for "card3".
std::set<int> numbersIn(const std::string& directory, std::string_view prefix, std::string_view suffix = {}) {
  std::set<int> numbers;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(directory, error), end; !error && entry != end;
       entry.increment(error)) {
    const std::string name = entry->path().filename().string();
    if (!name.starts_with(prefix) || !name.ends_with(suffix)) continue;
    if (name.size() <= prefix.size() + suffix.size()) continue;
    int number = 0;
    const char* last = name.data() + name.size() - suffix.size();
    const auto [end_, failure] = std::from_chars(name.data() + prefix.size(), last, number);
    if (failure == std::errc() && end_ == last && number >= 0) numbers.insert(number);
  }
  return numbers;
}

std::string numbered(const char* name, int number) { return name + std::to_string(number); }

std::string pathIn(const std::string& directory, const std::string& name) { return directory + "/" + name; }

std::optional<std::string> lineOf(const std::string& path) {
  std::string text;
  if (readTextFile(path, text)) return std::nullopt;
  text.resize(std::min(text.find('\n'), text.size()));
  return text;
}

std::optional<std::uint64_t> countIn(const std::string& path) {
  const std::optional<std::string> line = lineOf(path);
  std::uint64_t count = 0;
  if (!line || std::from_chars(line->data(), line->data() + line->size(), count).ec != std::errc()) {
    return std::nullopt;
  }
  return count;
}

ChanmeterRecord simpleRecord(ChanmeterKey key, const char* name, std::int64_t value) {
  key.name = name;
  return {.key = std::move(key), .unit = "frames", .format = kChanmeterFormatSimple, .value = value};
}

// Times in milliseconds; the duty cycles follow from them.
ChanmeterRecord stateRecord(ChanmeterKey key, const char* name, std::vector<ChanmeterState> states) {
  computeDutyCycles(states);
  key.name = name;
  return {.key = std::move(key), .unit = "ms", .format = kChanmeterFormatState, .states = std::move(states)};
}

std::vector<ChanmeterState> statesOf(const PcmStatus& status) {
  std::vector<ChanmeterState> states;
  states.reserve(kPcmStates.size() + 1);
  for (const char* name : kPcmStates) states.push_back({.name = name});
  auto present = std::find_if(states.begin(), states.end(),
                              [&status](const ChanmeterState& state) { return state.name == status.state; });
  if (present == states.end()) present = states.insert(present, {.name = status.state});
  present->residency = status.stateMilliseconds;
  return states;
}

bool isAnyChosen(const ChannelChoice& choice, ChanmeterKey key, std::initializer_list<const char*> names) {
  return std::any_of(names.begin(), names.end(), [&](const char* name) {
    key.name = name;
    return choice.includes(key);
  });
}

}  // namespace

void KernelSoundChannels::read(const ChannelChoice& choice, ChanmeterRecords& records,
                               std::optional<ChanmeterError>& error) {
  Reading reading{choice, records, error};
  for (const int number : cardNumbers()) {
    const std::string card = numbered("card", number);
    const std::string driver = identifierOf(number);
    if (!choice.mayInclude(driver)) continue;
    readPower(reading, driver, pathIn(pathIn(devices_, card), "device/power"));
    readSubstreams(reading, driver, pathIn(cards_, card), 'p');
    readSubstreams(reading, driver, pathIn(cards_, card), 'c');
  }
}

std::set<int> KernelSoundChannels::cardNumbers() const {
  std::set<int> numbers = numbersIn(cards_, "card");
  numbers.merge(numbersIn(devices_, "card"));
  return numbers;
}

std::string KernelSoundChannels::identifierOf(int card) const {
  std::string name = numbered("card", card);
  for (const std::string* directory : {&cards_, &devices_}) {
    const std::optional<std::string> line = lineOf(pathIn(pathIn(*directory, name), "id"));
    if (line && !line->empty()) return *line;
  }
  return name;
}

void KernelSoundChannels::readPower(Reading& reading, const std::string& driver,
                                    const std::string& directory) {
  const ChanmeterKey key{.driver = driver, .group = "Speaker"};
  if (!isAnyChosen(reading.choice, key, {"Power"})) return;
  // "unsupported" means that the device has no power management.
  const std::string status = lineOf(directory + "/runtime_status").value_or("unsupported");
  if (status == "unsupported") return;
  const std::optional<std::uint64_t> active = countIn(directory + "/runtime_active_time");
  const std::optional<std::uint64_t> suspended = countIn(directory + "/runtime_suspended_time");
  if (!active || !suspended) {
    return reportProblem(reading, kChannelsNotUnderstood, directory, "has no times in milliseconds");
  }
  addIfChosen(reading, stateRecord(key, "Power",
                                   {{.name = "active", .residency = *active},
                                    {.name = "suspended", .residency = *suspended}}));
}

void KernelSoundChannels::readSubstreams(Reading& reading, const std::string& driver, const std::string& card,
                                         char direction) {
  const char* group = direction == 'p' ? "Tx" : "Rx";
  for (const int device : numbersIn(card, "pcm", {&direction, 1})) {
    const std::string pcm = numbered("pcm", device);
    std::string directory = pathIn(card, pcm);
    directory += direction;
    for (const int substream : numbersIn(directory, "sub")) {
      const std::string sub = numbered("sub", substream);
      ChanmeterKey key{.driver = driver, .group = group, .subGroup = pcm};
      key.subGroup->append(" ").append(sub);
      if (++reading.substreams > kMaxSubstreams) {
        return reportProblem(reading, kChannelsTooMany, directory, "has one substream too many");
      }
      readSubstream(reading, std::move(key), pathIn(directory, sub));
    }
  }
}

void KernelSoundChannels::readSubstream(Reading& reading, ChanmeterKey key, const std::string& directory) {
  if (!isAnyChosen(reading.choice, key, {"Hardware Position", "Delay", "State"})) return;
  std::string text;
  std::string parameters;
  if (readTextFile(directory + "/status", text)) return;  // the card was removed
  if (readTextFile(directory + "/hw_params", parameters)) parameters.clear();
  const std::optional<PcmStatus> status = PcmStatus::parse(text, parameters);
  if (!status)
    return reportProblem(reading, kChannelsNotUnderstood, directory + "/status", "is not understood");
  addIfChosen(reading, simpleRecord(key, "Hardware Position", status->hardwarePosition));
  addIfChosen(reading, simpleRecord(key, "Delay", status->delay));
  addIfChosen(reading, stateRecord(std::move(key), "State", statesOf(*status)));
}

void KernelSoundChannels::addIfChosen(Reading& reading, ChanmeterRecord record) {
  if (reading.choice.includes(record.key)) reading.records.push_back(shared(std::move(record)));
}

std::shared_ptr<const ChanmeterRecord> KernelSoundChannels::shared(ChanmeterRecord record) {
  const MutexLock lock(mutex_);
  if (latest_.size() >= kMaxKept) latest_.clear();  // records of removed cards
  auto& latest = latest_[record.key];
  if (latest == nullptr || *latest != record) {
    latest = std::make_shared<const ChanmeterRecord>(std::move(record));
  }
  return latest;
}

void KernelSoundChannels::reportProblem(Reading& reading, std::int64_t code, const std::string& path,
                                        std::string_view what) {
  if (!reading.error) reading.error = ChanmeterError{code};
  const MutexLock lock(mutex_);
  if (loggedPaths_.size() >= kMaxSubstreams || !loggedPaths_.insert(path).second) return;
  errorLog(log_, "%s: %s (failure %lli; the channels concerned are left out)", path, what, code);
}

}  // namespace tonewerk
