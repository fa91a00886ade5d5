// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/ProcessTable.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <filesystem>
#include <optional>
#include <string_view>
#include <unistd.h>

#include "platform/linux/TextFile.h"

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

// The number behind "\nName:" and white space, 0 without such a line.
std::uint64_t numberOnLine(std::string_view status, std::string_view name) {
  const std::string start = "\n" + std::string(name) + ":";
  const std::size_t line = status.find(start);
  if (line == std::string_view::npos) return 0;
  status.remove_prefix(line + start.size());
  status.remove_prefix(std::min(status.find_first_not_of(" \t"), status.size()));
  return numberOf<std::uint64_t>(status);
}

// Fields of "123 (name) S 1 ..." behind the name, which may hold anything, closing brackets included.
constexpr std::size_t kState = 0;
constexpr std::size_t kParent = 1;
constexpr std::size_t kUserTicks = 11;
constexpr std::size_t kSystemTicks = 12;
constexpr std::size_t kThreads = 17;
constexpr std::size_t kFields = 18;

bool readStat(std::string_view text, ProcessRow& row) {
  const std::size_t opening = text.find('(');
  const std::size_t closing = text.rfind(')');
  if (opening == std::string_view::npos || closing == std::string_view::npos || closing < opening) {
    return false;
  }
  row.name = text.substr(opening + 1, closing - opening - 1);
  text.remove_prefix(closing + 1);
  std::array<std::string_view, kFields> fields;
  for (std::string_view& field : fields) {
    text.remove_prefix(std::min(text.find_first_not_of(' '), text.size()));
    field = text.substr(0, text.find(' '));
    if (field.empty()) return false;
    text.remove_prefix(field.size());
  }
  row.state = fields[kState].front();
  row.parent = numberOf<std::int32_t>(fields[kParent]);
  row.threads = numberOf<std::int64_t>(fields[kThreads]);
  const auto ticks =
      numberOf<std::uint64_t>(fields[kUserTicks]) + numberOf<std::uint64_t>(fields[kSystemTicks]);
  row.processorSeconds = static_cast<double>(ticks) / static_cast<double>(sysconf(_SC_CLK_TCK));
  return true;
}

std::optional<ProcessRow> readProcess(const std::string& directory, std::int32_t identifier) {
  ProcessRow row;
  row.identifier = identifier;
  std::string text;
  if (readTextFile(directory + "/stat", text) || !readStat(text, row)) return std::nullopt;
  if (readTextFile(directory + "/status", text)) return std::nullopt;
  row.residentBytes = numberOnLine(text, "VmRSS") * kKibibyte;
  row.privateBytes = (numberOnLine(text, "RssAnon") + numberOnLine(text, "VmSwap")) * kKibibyte;
  row.lockedBytes = numberOnLine(text, "VmLck") * kKibibyte;
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
