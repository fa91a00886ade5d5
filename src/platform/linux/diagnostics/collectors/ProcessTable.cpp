// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/ProcessTable.h"

#include <optional>
#include <string_view>
#include <system_error>
#include <unistd.h>
#include <utility>

#include "platform/linux/files/KeyValueLines.h"
#include "platform/linux/system/ProcessFiles.h"
#include "platform/linux/system/ProcessStat.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kKibibyte = 1024;

bool readStat(std::string_view text, ProcessRow& row) {
  const std::optional<ProcessStat> stat = ProcessStat::parse(text);
  if (!stat) return false;
  row.name = validUtf8(std::string(stat->name));  // the kernel cut it to 15 bytes
  const char state = stat->fields[ProcessStat::kState].front();
  row.state = state > ' ' && state <= '~' ? state : '?';
  row.parent = numberIn<std::int32_t>(stat->fields[ProcessStat::kParent]);
  row.threads = numberIn<std::int64_t>(stat->fields[ProcessStat::kThreads]);
  const auto ticks = numberIn<std::uint64_t>(stat->fields[ProcessStat::kUserTicks]) +
                     numberIn<std::uint64_t>(stat->fields[ProcessStat::kSystemTicks]);
  row.processorSeconds = static_cast<double>(ticks) / static_cast<double>(sysconf(_SC_CLK_TCK));
  return true;
}

std::optional<ProcessRow> readProcess(const ProcessFiles& files, std::int32_t process) {
  ProcessRow row;
  row.identifier = process;
  std::string text;
  if (files.read(process, "stat", text) || !readStat(text, row)) return std::nullopt;
  if (files.read(process, "status", text)) return std::nullopt;
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
  const ProcessFiles files(procDirectory);
  std::error_code error;
  for (const std::int32_t process : files.processes(error)) {
    if (auto row = readProcess(files, process)) rows.push_back(std::move(*row));
  }
  return rows;
}

}  // namespace tonewerk
