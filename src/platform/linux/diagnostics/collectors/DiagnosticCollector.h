// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

namespace tonewerk {

// Collects one kind of evidence. Each call runs on a thread of its own; a collector never has two calls at
// once. If a call does not return in time, the runner does not wait for it, and the collector lives until the
// call returns.
class DiagnosticCollector {
 public:
  struct Result {
    std::string text;     // the file's contents; if it is empty, there is no file
    std::string problem;  // describes what went wrong; empty if nothing did
  };

  virtual ~DiagnosticCollector() = default;

  // The name of its file, such as "processes.txt".
  virtual std::string_view fileName() const = 0;

  // Must limit how much it reads. The runner limits its time.
  [[nodiscard]] virtual Result collect() = 0;
};

}  // namespace tonewerk
