// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "tools/twctl/completion/Candidate.h"

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace tonewerk {

// Where a command line that is being typed stands: what its last word can be.
struct CompletionPoint {
  enum class Kind {
    kOption,    // an option of `command`
    kCommand,   // a command below `command`
    kValue,     // the value of `option`
    kArgument,  // the positional argument `option`
    kForeign,   // a word of another program's command line, which begins at `foreignAt`
    kNothing,   // nothing can stand here, or what is before it is wrong
  };

  Kind kind = Kind::kNothing;
  const CLI::App* command = nullptr;    // the innermost one
  const CLI::Option* option = nullptr;  // of kValue and kArgument
  std::string path;                     // the names of the command, such as "defaults write"
  std::vector<std::string> arguments;   // the positional arguments before the word
  std::size_t foreignAt = 0;            // a place in the words
  std::string before;                   // what of the word is before the value, such as "--type="
  std::string word;                     // what there is of it
  bool systemWide = false;              // --system was given
};

// `words` are those after the program's name; the last one, which may be empty, is the one to complete. `app`
// has all commands with their options.
CompletionPoint completionPointOf(const CLI::App& app, const std::vector<std::string>& words);

// The place in `words`, which are complete, of another program's command line: what follows a command that
// takes one, such as sandbox, with or without "--" before it. None when there is none.
std::optional<std::size_t> foreignCommandIn(const CLI::App& app, const std::vector<std::string>& words);

// The commands, options or choices that the tree itself knows for this point, in its order, with their
// descriptions; those that begin with the word. Hidden commands are left out.
//
// An option or argument whose type is like "csv|jsonl" has these choices.
std::vector<Candidate> candidatesOfTree(const CompletionPoint& point);

}  // namespace tonewerk
