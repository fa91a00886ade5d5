// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// Reads lines that a person types.
class LineReader {
 public:
  virtual ~LineReader() = default;

  struct Line {
    enum class Kind {
      kText,
      kCancelled,  // by Ctrl-C: what was typed is dropped
      kEnd,        // by Ctrl-D, or because the terminal has gone
    };
    Kind kind = Kind::kEnd;
    std::string text;  // without the line end
  };

  // Shows `prompt`, and waits for a line.
  [[nodiscard]] virtual Line read(const std::string& prompt) = 0;
};

}  // namespace tonewerk
