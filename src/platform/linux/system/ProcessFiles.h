// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

namespace tonewerk {

// Lists the processes in /proc and reads the kernel's files about each.
class ProcessFiles {
 public:
  // `directory` is "/proc", or a copy of its layout in tests.
  explicit ProcessFiles(std::string directory) : directory_(std::move(directory)) {}

  // The identifiers of all processes, sorted. If the directory cannot be read to its end, `error` is set and
  // the result holds those found so far.
  std::vector<std::int32_t> processes(std::error_code& error) const;

  // Reads one file of a process, "stat" or "status". An empty file is an error. Processes choose their own
  // names, so a name in the file may hold any bytes.
  [[nodiscard]] std::error_code read(std::int32_t process, const std::string& file, std::string& bytes) const;

  // Whether read() failed because the process has ended.
  static bool isGone(const std::error_code& error);

 private:
  const std::string directory_;
};

}  // namespace tonewerk
