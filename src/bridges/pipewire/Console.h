// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdio>
#include <string_view>

namespace tonewerk {

// Writes lines to standard error for the person who runs the bridge.
class Console {
 public:
  // `out` outlives this object.
  explicit Console(bool verbose, std::FILE* out = stderr) : verbose_(verbose), out_(out) {}

  // Writes an important event: a daemon has come or gone, a request was refused.
  void say(std::string_view line) const;
  // Writes a detail; only when verbose.
  void detail(std::string_view line) const;
  bool isVerbose() const { return verbose_; }

 private:
  bool verbose_;
  std::FILE* out_;
};

}  // namespace tonewerk
