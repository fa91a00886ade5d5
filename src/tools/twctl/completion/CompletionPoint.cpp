// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/completion/CompletionPoint.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <utility>

namespace tonewerk {
namespace {

using Kind = CompletionPoint::Kind;

bool isHidden(const CLI::App& command) { return command.get_group().empty(); }

const CLI::App* commandNamed(const CLI::App& command, const std::string& name) {
  for (const CLI::App* below : command.get_subcommands({})) {
    if (below->get_name() == name && !isHidden(*below)) return below;
  }
  return nullptr;
}

const CLI::Option* optionNamed(const CLI::App& command, const std::string& dashed) {
  for (const CLI::Option* option : command.get_options()) {
    if (option->nonpositional() && option->check_name(dashed)) return option;
  }
  return nullptr;
}

// The positional argument at this place. The last one takes all further words if it takes several.
const CLI::Option* argumentAt(const CLI::App& command, std::size_t place) {
  const CLI::Option* last = nullptr;
  for (const CLI::Option* option : command.get_options()) {
    if (!option->get_positional() || option->nonpositional()) continue;
    if (place == 0) return option;
    --place;
    last = option;
  }
  return last != nullptr && last->get_items_expected_max() > 1 ? last : nullptr;
}

// Walks over the words before the last one, as the parser would.
class Walk {
 public:
  explicit Walk(const CLI::App& app) { point_.command = &app; }

  // False when all further words are those of another program.
  bool pass(const std::string& word) {
    if (!isOnlyArguments_) {
      if (word == "--") {
        waiting_ = nullptr;
        isOnlyArguments_ = true;
        return true;
      }
      if (word.size() > 1 && word.front() == '-') {
        passOption(word);
        return true;
      }
      if (std::exchange(waiting_, nullptr) != nullptr) return true;
      if (const CLI::App* below = commandNamed(*point_.command, word)) {
        point_.command = below;
        point_.path += (point_.path.empty() ? "" : " ") + word;
        return true;
      }
      if (point_.command->get_prefix_command()) return false;
    }
    point_.arguments.push_back(word);
    return true;
  }

  CompletionPoint at(const std::string& word) {
    point_.word = word;
    const bool isDashed = !word.empty() && word.front() == '-' && !isOnlyArguments_;
    if (waiting_ != nullptr && !isDashed) {
      point_.kind = Kind::kValue;
      point_.option = waiting_;
    } else if (isDashed) {
      atOption(word);
    } else if (!isOnlyArguments_ && !point_.command->get_subcommands({}).empty()) {
      point_.kind = point_.arguments.empty() ? Kind::kCommand : Kind::kNothing;
    } else if (point_.command->get_prefix_command()) {
      point_.kind = Kind::kForeign;
    } else if (const CLI::Option* argument = argumentAt(*point_.command, point_.arguments.size())) {
      point_.kind = Kind::kArgument;
      point_.option = argument;
    }
    return std::move(point_);
  }

  CompletionPoint inForeign(std::size_t place, const std::string& word) {
    point_.kind = Kind::kForeign;
    point_.foreignAt = place;
    point_.word = word;
    return std::move(point_);
  }

  bool takesForeignWords() const { return isOnlyArguments_ && point_.command->get_prefix_command(); }

 private:
  void passOption(const std::string& word) {
    const std::size_t equals = word.find('=');
    const CLI::Option* option = optionNamed(*point_.command, word.substr(0, equals));
    point_.systemWide = point_.systemWide || word == "--system";
    const bool takesNext = option != nullptr && equals == std::string::npos;
    waiting_ = takesNext && option->get_items_expected_max() > 0 ? option : nullptr;
  }

  void atOption(const std::string& word) {
    point_.kind = Kind::kOption;
    const std::size_t equals = word.find('=');
    if (equals == std::string::npos) return;
    point_.option = optionNamed(*point_.command, word.substr(0, equals));
    const bool takesValue = point_.option != nullptr && point_.option->get_items_expected_max() > 0;
    point_.kind = takesValue ? Kind::kValue : Kind::kNothing;
    point_.before = word.substr(0, equals + 1);
    point_.word = word.substr(equals + 1);
  }

  CompletionPoint point_;
  const CLI::Option* waiting_ = nullptr;  // takes the next word as its value
  bool isOnlyArguments_ = false;          // after "--"
};

std::vector<std::string> choicesOf(const CLI::Option& option) {
  const std::string type = option.get_type_name();
  std::vector<std::string> choices;
  if (type.find('|') == std::string::npos) return choices;
  for (std::size_t from = 0; from <= type.size();) {
    const std::size_t end = std::min(type.find('|', from), type.size());
    choices.push_back(type.substr(from, end - from));
    from = end + 1;
  }
  return choices;
}

void addOptions(const CLI::App& command, std::vector<Candidate>& candidates) {
  for (const CLI::Option* option : command.get_options()) {
    if (!option->nonpositional() || option->get_group().empty()) continue;
    std::vector<std::string> names;
    for (const std::string& name : option->get_lnames()) names.push_back("--" + name);
    if (names.empty() && !option->get_snames().empty()) names.push_back("-" + option->get_snames().front());
    for (const std::string& name : names) candidates.push_back({name, option->get_description()});
  }
}

}  // namespace

CompletionPoint completionPointOf(const CLI::App& app, const std::vector<std::string>& words) {
  Walk walk(app);
  if (words.empty()) return walk.at("");
  for (std::size_t place = 0; place + 1 < words.size(); ++place) {
    if (walk.takesForeignWords() || !walk.pass(words[place])) return walk.inForeign(place, words.back());
  }
  CompletionPoint point = walk.at(words.back());
  if (point.kind == Kind::kForeign) point.foreignAt = words.size() - 1;
  return point;
}

std::optional<std::size_t> foreignCommandIn(const CLI::App& app, const std::vector<std::string>& words) {
  Walk walk(app);
  for (std::size_t place = 0; place < words.size(); ++place) {
    if (walk.takesForeignWords() || !walk.pass(words[place])) return place;
  }
  return std::nullopt;
}

std::vector<Candidate> candidatesOfTree(const CompletionPoint& point) {
  std::vector<Candidate> candidates;
  if (point.kind == Kind::kOption) {
    addOptions(*point.command, candidates);
  } else if (point.kind == Kind::kCommand) {
    for (const CLI::App* below : point.command->get_subcommands({})) {
      if (!isHidden(*below)) candidates.push_back({below->get_name(), below->get_description()});
    }
  } else if (point.option != nullptr) {
    for (const std::string& choice : choicesOf(*point.option)) candidates.push_back({choice});
  }
  std::erase_if(candidates,
                [&](const Candidate& candidate) { return !candidate.word.starts_with(point.word); });
  for (Candidate& candidate : candidates) candidate.word.insert(0, point.before);
  return candidates;
}

}  // namespace tonewerk
