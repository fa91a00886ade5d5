// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <set>
#include <string>

namespace tonewerk {

class FileSystem;
class JsonService;

// The signposts of a probe list. A name has 1 to kMaxNameBytes bytes, and neither control characters nor
// double quotes.
struct WantedSignposts {
  static constexpr std::size_t kMax = 200;
  static constexpr std::size_t kMaxNameBytes = 200;

  std::set<std::string> names;
  std::string problem;  // empty if the list is valid
};

[[nodiscard]] WantedSignposts readWantedSignposts(const std::string& path, const FileSystem& files,
                                                  const JsonService& json);

}  // namespace tonewerk
