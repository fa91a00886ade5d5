// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/completion/Candidate.h"

#include <algorithm>

#include "values/PrintableText.h"
#include "values/ShortenedText.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMaxWordBytes = 255;
constexpr std::size_t kMaxDescriptionBytes = 100;

bool isNumber(std::string_view text) {
  return !text.empty() && text.size() < 20 &&
         std::all_of(text.begin(), text.end(), [](char letter) { return letter >= '0' && letter <= '9'; });
}

// What a backslash between double quotes can escape.
bool isSpecialInQuotes(char letter) {
  return std::string_view("$`\"\\\n").find(letter) != std::string_view::npos;
}

}  // namespace

bool isOfferable(std::string_view word) {
  if (word.empty() || word.size() > kMaxWordBytes || !isPrintable(word)) return false;
  return word.front() != '-' || isNumber(word.substr(1));
}

std::string lineOf(const Candidate& candidate) {
  if (candidate.description.empty()) return candidate.word;
  const std::string description = printable(candidate.description);
  const std::string_view beginning = shortened(description, kMaxDescriptionBytes);
  return candidate.word + '\t' + std::string(beginning) +
         (beginning.size() < description.size() ? "\u2026" : "");
}

std::string unquoted(std::string_view typed) {
  std::string word;
  char quote = '\0';
  for (std::size_t at = 0; at < typed.size(); ++at) {
    const char letter = typed[at];
    const bool hasNext = at + 1 < typed.size();
    if (quote == '\0' && (letter == '\'' || letter == '"')) {
      quote = letter;
    } else if (quote != '\0' && letter == quote) {
      quote = '\0';
    } else if (letter == '\\' && quote != '\'' &&
               (quote == '\0' || (hasNext && isSpecialInQuotes(typed[at + 1])))) {
      if (hasNext) word += typed[++at];
    } else {
      word += letter;
    }
  }
  return word;
}

}  // namespace tonewerk
