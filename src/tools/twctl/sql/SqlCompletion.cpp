// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/SqlCompletion.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <cstddef>

#include "tools/twctl/sql/StoreNames.h"

namespace tonewerk {
namespace {

constexpr std::array<const char*, 36> kSqlWords{
    "AND",   "AS",   "ASC",   "AVG",    "BETWEEN", "BY",    "CASE",   "CAST",  "COUNT",
    "DESC",  "ELSE", "END",   "FROM",   "GLOB",    "GROUP", "HAVING", "IN",    "IS",
    "JOIN",  "LEFT", "LIKE",  "LIMIT",  "MAX",     "MIN",   "NOT",    "NULL",  "OR",
    "ORDER", "OVER", "ROUND", "SELECT", "SUM",     "THEN",  "WHEN",   "WHERE", "datetime"};

char lower(char c) { return static_cast<char>(std::tolower(static_cast<unsigned char>(c))); }

bool isOfWord(char c) { return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_'; }

bool beginsLike(std::string_view word, std::string_view begin) {
  return word.size() >= begin.size() && std::equal(begin.begin(), begin.end(), word.begin(),
                                                   [](char a, char b) { return lower(a) == lower(b); });
}

bool isSame(std::string_view a, std::string_view b) { return a.size() == b.size() && beginsLike(a, b); }

std::string_view withoutSpacesAtEnd(std::string_view text) {
  while (!text.empty() && std::isspace(static_cast<unsigned char>(text.back())) != 0) text.remove_suffix(1);
  return text;
}

void sortOnce(std::vector<std::string>& words) {
  std::sort(words.begin(), words.end());
  words.erase(std::unique(words.begin(), words.end()), words.end());
}

}  // namespace

SqlCompletion::SqlCompletion(SqlReader& reader)
    : tables_(viewsOf(reader)), words_(kSqlWords.begin(), kSqlWords.end()) {
  for (const std::string& table : tablesOf(reader)) tables_.push_back(table);
  sortOnce(tables_);
  words_.insert(words_.end(), tables_.begin(), tables_.end());
  for (const std::string& table : tables_) {
    for (const StoreColumn& column : columnsOf(reader, table)) words_.push_back(column.name);
  }
  sortOnce(words_);
}

std::string_view SqlCompletion::wordAtEnd(std::string_view line) {
  std::size_t begin = line.size();
  while (begin > 0 && isOfWord(line[begin - 1])) --begin;
  if (begin == 1 && line[0] == '.') begin = 0;
  return line.substr(begin);
}

std::vector<std::string> SqlCompletion::complete(std::string_view line) const {
  const std::string_view word = wordAtEnd(line);
  const std::string_view rest = withoutSpacesAtEnd(line.substr(0, line.size() - word.size()));
  const bool isCommand = rest.empty() && word.starts_with('.');
  const std::string_view before = wordAtEnd(rest);
  const bool isTable = isSame(before, "FROM") || isSame(before, "JOIN") || isSame(before, ".schema");
  std::vector<std::string> found;
  for (const std::string& name : isCommand ? promptCommands() : isTable ? tables_ : words_) {
    if (beginsLike(name, word)) found.push_back(name);
  }
  return found;
}

const std::vector<std::string>& promptCommands() {
  static const std::vector<std::string> commands{".help", ".quit", ".schema", ".tables"};
  return commands;
}

std::string commonBegin(const std::vector<std::string>& words) {
  if (words.empty()) return "";
  std::size_t length = words.front().size();
  for (const std::string& word : words) {
    length = std::min(length, word.size());
    for (std::size_t at = 0; at < length; ++at) {
      if (lower(word[at]) != lower(words.front()[at])) length = at;
    }
  }
  return words.front().substr(0, length);
}

}  // namespace tonewerk
