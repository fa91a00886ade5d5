// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/collectors/ProcessTableCollector.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <vector>

#include "platform/linux/diagnostics/collectors/ProcessTable.h"
#include "values/ControlCharacters.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kKibibyte = 1024;

std::string lineOf(const ProcessRow& row) {
  std::array<char, 160> text{};
  std::snprintf(text.data(), text.size(), "%8d %8d %c %7lld %12.2f %12llu %12llu %10llu  ", row.identifier,
                row.parent, row.state, static_cast<long long>(row.threads), row.processorSeconds,
                static_cast<unsigned long long>(row.residentBytes / kKibibyte),
                static_cast<unsigned long long>(row.privateBytes / kKibibyte),
                static_cast<unsigned long long>(row.lockedBytes / kKibibyte));
  // A process's name may contain any characters, including line breaks.
  return text.data() + withoutControlCharacters(row.name) + "\n";
}

bool hadMoreTime(const ProcessRow& a, const ProcessRow& b) { return a.processorSeconds > b.processorSeconds; }

}  // namespace

DiagnosticCollector::Result ProcessTableCollector::collect() {
  std::vector<ProcessRow> rows = readProcessTable(procDirectory_);
  if (rows.empty()) return {"", "no processes in " + procDirectory_};
  std::stable_sort(rows.begin(), rows.end(), hadMoreTime);
  Result result;
  result.text = "     pid   parent S threads  processor_s resident_kib  private_kib locked_kib  name\n";
  const std::size_t shown = std::min(rows.size(), maxRows_);
  for (std::size_t at = 0; at < shown; ++at) result.text += lineOf(rows[at]);
  if (shown < rows.size()) result.problem = "left out: " + std::to_string(rows.size() - shown) + " processes";
  return result;
}

}  // namespace tonewerk
