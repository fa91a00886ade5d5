// SPDX-License-Identifier: Apache-2.0
#include "tools/memory-usage/ProcReader.h"

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <string_view>
#include <system_error>

#include "platform/linux/files/KeyValueLines.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/system/ProcessStat.h"
#include "values/ControlCharacters.h"

namespace tonewerk {
namespace {

// None of these files is empty.
std::error_code readFile(const std::string& path, std::string& text) {
  if (const std::error_code error = readFileBytes(path, text)) return error;
  return text.empty() ? std::make_error_code(std::errc::io_error) : std::error_code();
}

template <typename Number>
std::optional<Number> numberOf(std::string_view word) {
  Number number{};
  const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), number);
  if (error != std::errc() || end != word.data() + word.size()) return std::nullopt;
  return number;
}

bool isGone(const std::error_code& error) {
  return error == std::errc::no_such_file_or_directory || error == std::errc::no_such_process;
}

double secondsOf(std::string_view ticks, double ticksPerSecond) {
  return static_cast<double>(numberOf<std::uint64_t>(ticks).value_or(0)) / ticksPerSecond;
}

}  // namespace

std::optional<UsageSnapshot> ProcReader::read(std::string& problem) const {
  std::error_code error;
  std::vector<std::string> numbers;
  for (std::filesystem::directory_iterator entry(root_, error), end; !error && entry != end;
       entry.increment(error)) {
    std::string name = entry->path().filename().string();
    if (numberOf<std::int32_t>(name).value_or(0) > 0) numbers.push_back(std::move(name));
  }
  if (error) {
    problem = root_ + ": " + error.message();
    return std::nullopt;
  }
  UsageSnapshot snapshot;
  for (const std::string& number : numbers) {
    ProcessUsage process;
    const Outcome outcome = readProcess(number, process);
    if (outcome == Outcome::kRead) snapshot.processes.push_back(std::move(process));
    if (outcome == Outcome::kUnreadable) ++snapshot.unreadable;
  }
  if (!readSystem(snapshot.system)) {
    problem = root_ + "/meminfo does not say how much memory there is";
    return std::nullopt;
  }
  std::sort(snapshot.processes.begin(), snapshot.processes.end(),
            [](const ProcessUsage& a, const ProcessUsage& b) { return a.process < b.process; });
  return snapshot;
}

ProcReader::Outcome ProcReader::readProcess(const std::string& number, ProcessUsage& process) const {
  const std::string directory = root_ + "/" + number;
  std::string text;
  if (const std::error_code error = readFile(directory + "/status", text)) {
    return isGone(error) ? Outcome::kGone : Outcome::kUnreadable;
  }
  const KeyValueLines status(text);
  const auto numberAt = [&](std::string_view name) { return status.number(name).value_or(0); };
  // Neither a thread of the kernel nor a process that has ended has any.
  if (!status.find("RssAnon")) return Outcome::kWithoutMemory;
  process.process = numberOf<std::int32_t>(number).value_or(0);
  process.user = static_cast<std::uint32_t>(numberAt("Uid"));
  process.name = printableAscii(std::string(status.find("Name").value_or("?")));
  process.usage.anonymous = numberAt("RssAnon");
  process.usage.shared = numberAt("RssFile") + numberAt("RssShmem");
  process.usage.locked = numberAt("VmLck");
  process.usage.pinned = numberAt("VmPin");
  process.usage.swapped = numberAt("VmSwap");

  std::string statText;
  if (const std::error_code error = readFile(directory + "/stat", statText)) {
    return isGone(error) ? Outcome::kGone : Outcome::kUnreadable;
  }
  const std::optional<ProcessStat> stat = ProcessStat::parse(statText);
  if (!stat) return Outcome::kUnreadable;
  process.usage.userSeconds = secondsOf(stat->fields[ProcessStat::kUserTicks], ticksPerSecond_);
  process.usage.systemSeconds = secondsOf(stat->fields[ProcessStat::kSystemTicks], ticksPerSecond_);
  return Outcome::kRead;
}

bool ProcReader::readSystem(MemoryUsage& system) const {
  std::string text;
  if (readFile(root_ + "/meminfo", text)) return false;
  const KeyValueLines memory(text);
  const auto numberAt = [&](std::string_view name) { return memory.number(name).value_or(0); };
  if (numberAt("MemTotal") == 0) return false;
  const auto difference = [&](std::string_view whole, std::uint64_t part) {
    const std::uint64_t total = numberAt(whole);
    return total - std::min(total, part);
  };
  system.anonymous = numberAt("AnonPages");
  system.shared = difference("MemTotal", numberAt("MemFree") + system.anonymous);
  system.locked = numberAt("Mlocked");
  system.pinned = numberAt("SUnreclaim") + numberAt("KernelStack") + numberAt("PageTables");
  system.swapped = difference("SwapTotal", numberAt("SwapFree"));
  readProcessorTime(system);
  return true;
}

// "cpu  user nice system idle iowait irq softirq ..."
void ProcReader::readProcessorTime(MemoryUsage& system) const {
  constexpr std::size_t kWords = 8;
  std::string text;
  if (readFile(root_ + "/stat", text)) return;
  const auto words = splitWhitespace(std::string_view(text).substr(0, text.find('\n')));
  if (words.size() < kWords || words[0] != "cpu") return;
  const auto seconds = [&](std::size_t word) { return secondsOf(words[word], ticksPerSecond_); };
  system.userSeconds = seconds(1) + seconds(2);
  system.systemSeconds = seconds(3) + seconds(6) + seconds(7);
}

}  // namespace tonewerk
