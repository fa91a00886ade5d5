// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/ProcessTable.h"

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <optional>
#include <string_view>
#include <unistd.h>

#include "platform/linux/files/KeyValueLines.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/system/ProcessStat.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

constexpr std::uint64_t kKibibyte = 1024;

template <typename T>
T numberOf(std::string_view text) {
  T number{};
  std::from_chars(text.data(), text.data() + text.size(), number);
  return number;
}

bool readStat(std::string_view text, ProcessRow& row) {
  const std::optional<ProcessStat> stat = ProcessStat::parse(text);
  if (!stat) return false;
  row.name = stat->name;
  row.state = stat->fields[ProcessStat::kState].front();
  row.parent = numberOf<std::int32_t>(stat->fields[ProcessStat::kParent]);
  row.threads = numberOf<std::int64_t>(stat->fields[ProcessStat::kThreads]);
  const auto ticks = numberOf<std::uint64_t>(stat->fields[ProcessStat::kUserTicks]) +
                     numberOf<std::uint64_t>(stat->fields[ProcessStat::kSystemTicks]);
  row.processorSeconds = static_cast<double>(ticks) / static_cast<double>(sysconf(_SC_CLK_TCK));
  return true;
}

std::optional<ProcessRow> readProcess(const std::string& directory, std::int32_t identifier) {
  ProcessRow row;
  row.identifier = identifier;
  std::string text;
  if (readTextFile(directory + "/stat", text) || !readStat(text, row)) return std::nullopt;
  if (readTextFile(directory + "/status", text)) return std::nullopt;
  const KeyValueLines status(text);
  const auto bytesAt = [&](std::string_view name) { return status.number(name).value_or(0) * kKibibyte; };
  row.residentBytes = bytesAt("VmRSS");
  row.privateBytes = bytesAt("RssAnon") + bytesAt("VmSwap");
  row.lockedBytes = bytesAt("VmLck");
  return row;
}

}  // namespace

std::vector<ProcessRow> readProcessTable(const std::string& procDirectory) {
  std::vector<ProcessRow> rows;
  std::error_code error;
  for (fs::directory_iterator at(procDirectory, error), end; !error && at != end; at.increment(error)) {
    const std::string name = at->path().filename().string();
    const auto identifier = numberOf<std::int32_t>(name);
    if (identifier <= 0 || std::to_string(identifier) != name) continue;
    if (auto row = readProcess(at->path().string(), identifier)) rows.push_back(std::move(*row));
  }
  const auto byIdentifier = [](const ProcessRow& a, const ProcessRow& b) {
    return a.identifier < b.identifier;
  };
  std::sort(rows.begin(), rows.end(), byIdentifier);
  return rows;
}

}  // namespace tonewerk
