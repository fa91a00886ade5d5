// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <set>
#include <string>

namespace tonewerk {

class FileSystem;
class JsonService;

// The signposts that a probe list asks for. A name has 1 to kMaxNameBytes bytes, none of them a control
// character or a double quote.
struct WantedSignposts {
  static constexpr std::size_t kMax = 200;
  static constexpr std::size_t kMaxNameBytes = 200;

  std::set<std::string> names;
  std::string problem;  // empty when the list is good
};

[[nodiscard]] WantedSignposts readWantedSignposts(const std::string& path, const FileSystem& files,
                                                  const JsonService& json);

}  // namespace tonewerk
