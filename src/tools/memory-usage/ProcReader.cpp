// SPDX-License-Identifier: Apache-2.0
#include "tools/memory-usage/ProcReader.h"

#include <algorithm>
#include <string_view>
#include <system_error>

#include "platform/linux/files/KeyValueLines.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/system/ProcessFiles.h"
#include "platform/linux/system/ProcessStat.h"
#include "values/ControlCharacters.h"

namespace tonewerk {
namespace {

double secondsOf(std::string_view ticks, double ticksPerSecond) {
  return static_cast<double>(numberIn<std::uint64_t>(ticks)) / ticksPerSecond;
}

}  // namespace

std::optional<UsageSnapshot> ProcReader::read(std::string& problem) const {
  std::error_code error;
  const std::vector<std::int32_t> processes = files_.processes(error);
  if (error) {
    problem = root_ + ": " + error.message();
    return std::nullopt;
  }
  UsageSnapshot snapshot;
  for (const std::int32_t process : processes) {
    ProcessUsage usage;
    const Outcome outcome = readProcess(process, usage);
    if (outcome == Outcome::kRead) snapshot.processes.push_back(std::move(usage));
    if (outcome == Outcome::kUnreadable) ++snapshot.unreadable;
  }
  if (!readSystem(snapshot.system)) {
    problem = root_ + "/meminfo does not say how much memory there is";
    return std::nullopt;
  }
  return snapshot;
}

ProcReader::Outcome ProcReader::readProcess(std::int32_t identifier, ProcessUsage& process) const {
  std::string text;
  if (const std::error_code error = files_.read(identifier, "status", text)) return outcomeOf(error);
  const KeyValueLines status(text);
  const auto numberAt = [&](std::string_view name) { return status.number(name).value_or(0); };
  // Kernel threads and ended processes have no private memory.
  if (!status.find("RssAnon")) return Outcome::kWithoutMemory;
  process.process = identifier;
  process.user = static_cast<std::uint32_t>(numberAt("Uid"));
  process.name = printableAscii(std::string(status.find("Name").value_or("?")));
  process.usage.anonymous = numberAt("RssAnon");
  process.usage.shared = numberAt("RssFile") + numberAt("RssShmem");
  process.usage.locked = numberAt("VmLck");
  process.usage.pinned = numberAt("VmPin");
  process.usage.swapped = numberAt("VmSwap");

  std::string statText;
  if (const std::error_code error = files_.read(identifier, "stat", statText)) return outcomeOf(error);
  const std::optional<ProcessStat> stat = ProcessStat::parse(statText);
  if (!stat) return Outcome::kUnreadable;
  process.usage.userSeconds = secondsOf(stat->fields[ProcessStat::kUserTicks], ticksPerSecond_);
  process.usage.systemSeconds = secondsOf(stat->fields[ProcessStat::kSystemTicks], ticksPerSecond_);
  return Outcome::kRead;
}

ProcReader::Outcome ProcReader::outcomeOf(const std::error_code& error) {
  return ProcessFiles::isGone(error) ? Outcome::kGone : Outcome::kUnreadable;
}

bool ProcReader::readSystem(MemoryUsage& system) const {
  std::string text;
  if (readFileBytes(root_ + "/meminfo", text)) return false;
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
  if (readFileBytes(root_ + "/stat", text)) return;
  const auto words = splitWhitespace(std::string_view(text).substr(0, text.find('\n')));
  if (words.size() < kWords || words[0] != "cpu") return;
  const auto seconds = [&](std::size_t word) { return secondsOf(words[word], ticksPerSecond_); };
  system.userSeconds = seconds(1) + seconds(2);
  system.systemSeconds = seconds(3) + seconds(6) + seconds(7);
}

}  // namespace tonewerk
