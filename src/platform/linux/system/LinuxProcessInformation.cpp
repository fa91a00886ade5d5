// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/LinuxProcessInformation.h"

#include <ctime>
#include <unistd.h>

#include "platform/linux/files/KeyValueLines.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kKibibyte = 1024;

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
  const KeyValueLines lines(status);
  const auto resident = lines.number("RssAnon");
  if (!resident) return "no RssAnon in " + path;
  // Kernels built without swap support do not write VmSwap.
  return (*resident + lines.number("VmSwap").value_or(0)) * kKibibyte;
}

std::int64_t LinuxProcessInformation::processorTimeMicroseconds() const {
  static_assert(CLOCKS_PER_SEC == 1'000'000);
  return std::clock();
}

}  // namespace tonewerk
