// SPDX-License-Identifier: Apache-2.0
#include "workers/diagnostics/MemoryLogTool.h"

#include <algorithm>
#include <array>

#include "platform/Log.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr std::string_view kLinePrefix = "wiredlog:";

constexpr std::string_view kWiredMemory = " wired_mem ";
constexpr std::array<std::string_view, 5> kKeptWords{" cpu_time ", " phys_mem ", kWiredMemory,
                                                     " phys_footprint ", "RESOURCE"};
// The line of a process that has no wired memory.
constexpr std::string_view kNoWiredMemory = "wired_mem          0           0           0        none";

bool contains(std::string_view line, std::string_view word) {
  return line.find(word) != std::string_view::npos;
}

bool isMemoryLine(std::string_view line) {
  const auto word = std::find_if(kKeptWords.begin(), kKeptWords.end(),
                                 [&](std::string_view candidate) { return contains(line, candidate); });
  if (word == kKeptWords.end()) return false;
  return *word != kWiredMemory || !contains(line, kNoWiredMemory);
}

// Removes the next line, with its line end, from `text` and returns it.
std::string_view takeLine(std::string_view& text) {
  const std::size_t end = text.substr(0, MemoryLogTool::kMaxLineBytes).find('\n');
  const std::size_t size = end == std::string_view::npos ? MemoryLogTool::kMaxLineBytes : end + 1;
  const std::string_view line = text.substr(0, size);
  text.remove_prefix(line.size());
  return line;
}

}  // namespace

std::string MemoryLogTool::capture(CommandRunner& commands) const {
  errorLog(TWReportingSessionCategory(), "%s requesting '%s'", kLinePrefix, command_);
  const CommandRunner::Result result = commands.run(command_, kLimits);
  if (result.end == CommandRunner::End::kNotStarted) {
    errorLog(TWReportingSessionCategory(), "%s unable to execute '%s'", kLinePrefix, command_);
    return {};
  }
  logEnd(result);
  std::string kept = keptLines(result.output, filter_);
  errorLog(TWReportingSessionCategory(), "%s request %s captured", kLinePrefix, command_);
  return kept;
}

std::string MemoryLogTool::keptLines(std::string_view output, Filter filter) {
  if (filter == Filter::kNone) return std::string(output);
  std::string kept;
  while (!output.empty()) {
    const std::string_view line = takeLine(output);
    if (!isMemoryLine(line)) continue;
    kept += kLinePrefix;
    kept += ' ';
    kept += line;
  }
  return kept;
}

// Logs why the output may be incomplete, if it may.
void MemoryLogTool::logEnd(const CommandRunner::Result& result) const {
  switch (result.end) {
    case CommandRunner::End::kTooLong:
      errorLog(TWReportingSessionCategory(), "%s '%s' was stopped after %lli seconds", kLinePrefix, command_,
               std::chrono::duration_cast<std::chrono::seconds>(kLimits.time).count());
      break;
    case CommandRunner::End::kTooMuch:
      errorLog(TWReportingSessionCategory(), "%s '%s' was stopped after %zu bytes", kLinePrefix, command_,
               kLimits.bytes);
      break;
    case CommandRunner::End::kSignalled:
      errorLog(TWReportingSessionCategory(), "%s '%s' died of signal %d", kLinePrefix, command_,
               result.number);
      break;
    case CommandRunner::End::kExited:
      if (result.number == 0) break;
      errorLog(TWReportingSessionCategory(), "%s '%s' failed with status %d", kLinePrefix, command_,
               result.number);
      break;
    case CommandRunner::End::kNotStarted:
      break;
  }
}

}  // namespace tonewerk
