// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// A word that a shell may offer, and what it stands for; the description may be empty.
struct Candidate {
  std::string word;
  std::string description = {};
};

// Whether a shell may offer this word. Words that other users choose may hold control characters, or look
// like an option of twctl.
[[nodiscard]] bool isOfferable(std::string_view word);

// A line of the answer to a shell: "word", or "word<TAB>description". The description is escaped and cut.
std::string lineOf(const Candidate& candidate);

// The word that somebody has typed into bash: without its quotes and backslashes. Nothing is expanded. A
// quote that is still open ends with the text.
std::string unquoted(std::string_view typed);

}  // namespace tonewerk
