// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "tools/twctl/sql/LineReader.h"

namespace tonewerk {

// Reads lines from the terminal that is standard input and output, with line editing, history and completion.
// The user's ~/.editrc applies. There may be one object at a time.
class EditedLines final : public LineReader {
 public:
  // The words with which `line`, which ends at the cursor, may go on.
  using Complete = std::function<std::vector<std::string>(std::string_view line)>;

  // The lines of earlier times are in the file `history`, which the destructor writes again, readable for its
  // owner alone. Without it, or where it cannot be written, nothing is kept.
  EditedLines(std::string history, Complete complete);
  ~EditedLines() override;

  [[nodiscard]] Line read(const std::string& prompt) override;

 private:
  struct Editor;
  const std::unique_ptr<Editor> editor_;
};

}  // namespace tonewerk
