// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "tools/twctl/sql/SqlReader.h"

namespace tonewerk {

// Finds the words with which a line may go on.
class SqlCompletion {
 public:
  // Reads the names in the file. They stay those of now.
  explicit SqlCompletion(SqlReader& reader);

  // The word at the end of `line`: letters, digits and underscores, and the dot of a command.
  static std::string_view wordAtEnd(std::string_view line);

  // The words that begin like the one at the end of `line`, in any case. Behind FROM, JOIN and .schema they
  // are tables and views, at the beginning of a line also commands, else columns, tables, views and SQL's own
  // words. Sorted, each once.
  std::vector<std::string> complete(std::string_view line) const;

 private:
  std::vector<std::string> tables_;
  std::vector<std::string> words_;
};

// The commands of the prompt, such as ".tables".
const std::vector<std::string>& promptCommands();

// What all words begin with.
std::string commonBegin(const std::vector<std::string>& words);

}  // namespace tonewerk
