// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/ProcessFiles.h"

#include <algorithm>
#include <charconv>
#include <filesystem>

#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

// The process identifier that a directory is named after; 0 if it is not a process's directory. Identifiers
// have no leading zeros.
std::int32_t processOf(const std::string& name) {
  std::int32_t process = 0;
  const auto parsed = std::from_chars(name.data(), name.data() + name.size(), process);
  return parsed.ec == std::errc() && std::to_string(process) == name ? std::max(process, 0) : 0;
}

}  // namespace

std::vector<std::int32_t> ProcessFiles::processes(std::error_code& error) const {
  std::vector<std::int32_t> found;
  error.clear();
  for (std::filesystem::directory_iterator at(directory_, error), end; !error && at != end;
       at.increment(error)) {
    const std::int32_t process = processOf(at->path().filename().string());
    if (process > 0) found.push_back(process);
  }
  std::sort(found.begin(), found.end());
  return found;
}

std::error_code ProcessFiles::read(std::int32_t process, const std::string& file, std::string& bytes) const {
  const std::string path = directory_ + "/" + std::to_string(process) + "/" + file;
  if (const std::error_code error = readFileBytes(path, bytes)) return error;
  return bytes.empty() ? std::make_error_code(std::errc::io_error) : std::error_code();
}

bool ProcessFiles::isGone(const std::error_code& error) {
  return error == std::errc::no_such_file_or_directory || error == std::errc::no_such_process;
}

}  // namespace tonewerk
