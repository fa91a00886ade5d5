// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/LinuxProcessInformation.h"

#include <array>
#include <cerrno>
#include <ctime>
#include <fcntl.h>
#include <string>
#include <string_view>
#include <system_error>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/KeyValueLines.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

constexpr std::uint64_t kKibibyte = 1024;

bool hasSwapLine(std::string_view status) {
  const std::size_t line = status.find("\nVmSwap:");
  return line != std::string_view::npos && status.find('\n', line + 1) != std::string_view::npos;
}

// Reads a status file up to the line of the swapped memory; to its end if it has none. What comes after that
// line is not needed, and without it one call of the system is enough.
std::error_code readThroughSwapLine(const std::string& path, std::string& status) {
  const FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY));
  if (!file) return lastSystemError();
  std::array<char, 4096> block;
  while (!hasSwapLine(status)) {
    const ssize_t count = ::read(file.get(), block.data(), block.size());
    if (count == 0) break;
    if (count > 0) {
      status.append(block.data(), static_cast<std::size_t>(count));
    } else if (errno != EINTR) {
      return lastSystemError();
    }
  }
  return {};
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
  if (clock_ == nullptr) return readFootprint();
  const std::chrono::nanoseconds now = clock_->monotonic();
  const MutexLock lock(mutex_);
  if (footprint_ && now - footprint_->at <= kMaxFootprintAge) return footprint_->bytes;
  footprint_.reset();
  auto read = readFootprint();
  if (const auto* bytes = std::get_if<std::uint64_t>(&read)) footprint_ = Footprint{now, *bytes};
  return read;
}

std::variant<std::uint64_t, std::string> LinuxProcessInformation::readFootprint() const {
  std::string status;
  if (const std::error_code error = readThroughSwapLine(statusPath_, status)) return error.message();
  const std::size_t wanted = status.find("\nRssAnon:");  // the line of the swapped memory comes later
  const KeyValueLines lines(std::string_view(status).substr(wanted == std::string::npos ? 0 : wanted + 1));
  const auto resident = lines.number("RssAnon");
  if (!resident) return "no RssAnon in " + statusPath_;
  // Kernels built without swap support do not write VmSwap.
  return (*resident + lines.number("VmSwap").value_or(0)) * kKibibyte;
}

std::int64_t LinuxProcessInformation::processorTimeMicroseconds() const {
  static_assert(CLOCKS_PER_SEC == 1'000'000);
  return std::clock();
}

}  // namespace tonewerk
