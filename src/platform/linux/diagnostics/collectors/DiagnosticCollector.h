// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

namespace tonewerk {

// Takes one kind of evidence. Each call runs on a thread of its own, never two calls of one collector at
// once. A collector that does not return is left behind; its object then lives until it does.
class DiagnosticCollector {
 public:
  struct Result {
    std::string text;     // the file's; no file when it is empty
    std::string problem;  // what went wrong, in words; empty when nothing did
  };

  virtual ~DiagnosticCollector() = default;

  // Of the file that it fills: "processes.txt".
  virtual std::string_view fileName() const = 0;

  // Bounded in what it reads; what it takes too long for is its runner's to judge.
  [[nodiscard]] virtual Result collect() = 0;
};

}  // namespace tonewerk
