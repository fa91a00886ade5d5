// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

namespace tonewerk {

// The processes that are there, and the files that the kernel keeps of each, as /proc shows them.
class ProcessFiles {
 public:
  // `directory` is "/proc", or what looks like it.
  explicit ProcessFiles(std::string directory) : directory_(std::move(directory)) {}

  // The numbers of all processes, in order. With `error` when the directory cannot be read to its end; then
  // those that were found.
  std::vector<std::int32_t> processes(std::error_code& error) const;

  // The bytes of one file of a process, "stat" or "status"; neither is ever empty. A name in them is what the
  // process chose.
  [[nodiscard]] std::error_code read(std::int32_t process, const std::string& file, std::string& bytes) const;

  // Whether read() failed because the process has ended.
  static bool isGone(const std::error_code& error);

 private:
  const std::string directory_;
};

}  // namespace tonewerk
