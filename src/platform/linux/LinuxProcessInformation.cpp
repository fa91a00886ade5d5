// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/LinuxProcessInformation.h"

#include <charconv>
#include <ctime>
#include <string_view>
#include <unistd.h>

#include "platform/linux/TextFile.h"

namespace tonewerk {
namespace {

// The number of kibibytes on the line "Name:    123 kB", in bytes.
std::optional<std::uint64_t> bytesOnLine(std::string_view status, std::string_view name) {
  const std::string start = "\n" + std::string(name) + ":";
  const std::size_t line = status.find(start);
  if (line == std::string_view::npos) return std::nullopt;
  status.remove_prefix(line + start.size());
  const std::size_t digit = status.find_first_not_of(" \t");
  if (digit == std::string_view::npos) return std::nullopt;
  status.remove_prefix(digit);
  std::uint64_t kibibytes = 0;
  const auto parsed = std::from_chars(status.data(), status.data() + status.size(), kibibytes);
  if (parsed.ec != std::errc()) return std::nullopt;
  return kibibytes * 1024;
}

}  // namespace

std::optional<std::string> LinuxProcessInformation::processName(std::int32_t processIdentifier) const {
  if (processIdentifier <= 0) return std::nullopt;
  std::string name;
  if (readTextFile(procDirectory_ + "/" + std::to_string(processIdentifier) + "/comm", name))
    return std::nullopt;
  if (!name.empty() && name.back() == '\n') name.pop_back();
  return name;
}

std::int32_t LinuxProcessInformation::ownProcessIdentifier() const { return getpid(); }

std::variant<std::uint64_t, std::string> LinuxProcessInformation::physicalFootprint() const {
  const std::string path = procDirectory_ + "/self/status";
  std::string status;
  if (const std::error_code error = readTextFile(path, status)) return error.message();
  const auto resident = bytesOnLine(status, "RssAnon");
  if (!resident) return "no RssAnon in " + path;
  // Kernels built without swapping have no such line.
  return *resident + bytesOnLine(status, "VmSwap").value_or(0);
}

std::int64_t LinuxProcessInformation::processorTimeMicroseconds() const {
  static_assert(CLOCKS_PER_SEC == 1'000'000);
  return std::clock();
}

}  // namespace tonewerk
