// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <string>

#include "tools/twctl/Tool.h"
#include "tools/twctl/sql/LineReader.h"
#include "tools/twctl/sql/RowWriter.h"
#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// The prompt of `twctl sql`: reads statements, which end with ";" or an empty line, and commands, which begin
// with a dot, until the user quits.
class SqlPrompt {
 public:
  // `path` is the file that `reader` reads. All arguments outlive the prompt.
  SqlPrompt(Tool& tool, SqlReader& reader, LineReader& lines, std::string path)
      : tool_(tool), reader_(reader), lines_(lines), path_(std::move(path)) {}

  // Returns the format for the terminal as it is now: its width may change.
  using Format = std::function<RowFormat()>;
  // Runs a statement, and prints its rows and problems.
  using Run = std::function<void(const std::string& statement, const RowFormat& format)>;

  // Until the user quits or the output fails.
  void run(const Format& format, const Run& runStatement);

 private:
  void greet() const;
  // False when it ends the prompt.
  [[nodiscard]] bool runCommand(const std::string& line, const RowFormat& format);
  void showTables(const RowFormat& format);
  void showSchema(const std::string& name, const RowFormat& format);
  void complain(const std::string& problem) const;

  Tool& tool_;
  SqlReader& reader_;
  LineReader& lines_;
  const std::string path_;
};

}  // namespace tonewerk
