// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/UsageProblem.h"

#include <CLI/CLI.hpp>
#include <vector>

#include "tools/twctl/input/Suggestion.h"
#include "values/ClosestName.h"

namespace tonewerk {
namespace {

// The commands on the command line, outermost first, such as the tool itself, "defaults", "write".
std::vector<const CLI::App*> commandsIn(const CLI::App& app) {
  std::vector<const CLI::App*> commands{&app};
  while (!commands.back()->get_subcommands().empty())
    commands.push_back(commands.back()->get_subcommands().back());
  return commands;
}

std::vector<std::string> optionsOf(const CLI::App& command) {
  std::vector<std::string> names;
  for (const CLI::Option* option : command.get_options()) {
    for (const std::string& name : option->get_lnames()) names.push_back("--" + name);
  }
  return names;
}

std::vector<std::string> commandsOf(const CLI::App& command) {
  std::vector<std::string> names;
  for (const CLI::App* below : command.get_subcommands({})) names.push_back(below->get_name());
  return names;
}

// "unknown command 'evnts'; did you mean 'events'?", without the question when no name is close.
std::string unknown(const std::string& what, const std::string& word, const std::vector<std::string>& names) {
  const auto meant = closestTo(word, names);
  return "unknown " + what + " '" + word + "'" + (meant ? "; " + didYouMean(*meant) : "");
}

std::string problemWithWord(const CLI::App& command, const std::string& word) {
  if (word.size() > 1 && word.front() == '-')
    return unknown("option", word.substr(0, word.find('=')), optionsOf(command));
  const std::vector<std::string> commands = commandsOf(command);
  return commands.empty() ? "unexpected argument '" + word + "'" : unknown("command", word, commands);
}

// The parser's text is like "--limit: 1 required INT missing".
std::string mismatchOf(const std::string& text) {
  return text.ends_with(" missing") ? text.substr(0, text.find(": ")) + " needs a value" : text;
}

// The words that name the command, such as "twctl defaults".
std::string callOf(const std::vector<const CLI::App*>& commands) {
  std::string call;
  for (const CLI::App* command : commands) call += (call.empty() ? "" : " ") + command->get_name();
  return call;
}

}  // namespace

std::string usageProblem(const CLI::App& app, const CLI::ParseError& error) {
  const std::vector<const CLI::App*> commands = commandsIn(app);
  for (const CLI::App* command : commands) {
    const std::vector<std::string> unread = command->remaining();
    if (!unread.empty()) return problemWithWord(*command, unread.front());
  }
  const bool lacksCommand =
      dynamic_cast<const CLI::RequiredError*>(&error) != nullptr && !commandsOf(*commands.back()).empty();
  if (dynamic_cast<const CLI::ArgumentMismatch*>(&error) != nullptr) return mismatchOf(error.what());
  return lacksCommand ? "a command is required; see " + callOf(commands) + " --help" : error.what();
}

}  // namespace tonewerk
