// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/Tool.h"

namespace CLI {
class App;
}

namespace tonewerk {

// A shell's question about a command line that is being typed:
//
//   twctl __complete SHELL SECONDS WORD...
//
// SHELL is "bash", whose words are as they were typed, or another one, whose words have no quotes any more.
// The words are those after the program's name; the last one is to be completed. SECONDS bounds how long
// things are looked up.
struct CompletionQuestion {
  std::vector<std::string> words;
  double seconds = 1.0;

  // None when the arguments are no such question.
  [[nodiscard]] static std::optional<CompletionQuestion> read(int argc, const char* const* argv);
};

// Answers with a line that says what the shell is to do, and then the candidates, a line each:
//
//   words           offer these; then "words nospace": without a space behind them
//   files           complete a file's name
//   recordings      complete the name of a recording
//   command N       complete the command line that begins after N words, the program's name included
//
// After a line of words, each is alone or followed by a tab and its description. When the daemon or a file
// takes longer than the question allows, the process ends at once, with what it knew. `app` has all commands.
void answerCompletion(const CLI::App& app, const Tool& tool, const CompletionQuestion& question);

}  // namespace tonewerk
