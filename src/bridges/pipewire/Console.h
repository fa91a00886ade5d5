// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdio>
#include <string_view>

namespace tonewerk {

// What the bridge tells the person who runs it: lines on standard error.
class Console {
 public:
  // `out` outlives this.
  explicit Console(bool verbose, std::FILE* out = stderr) : verbose_(verbose), out_(out) {}

  // What anybody should know: a peer that came or went, a request that was refused.
  void say(std::string_view line) const;
  // What happens, step by step; shown when verbose.
  void detail(std::string_view line) const;
  bool isVerbose() const { return verbose_; }

 private:
  bool verbose_;
  std::FILE* out_;
};

}  // namespace tonewerk
