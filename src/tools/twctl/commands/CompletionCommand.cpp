// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/CompletionCommand.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <cmath>
#include <csignal>
#include <memory>
#include <ostream>
#include <string_view>
#include <sys/time.h>
#include <system_error>
#include <unistd.h>

#include "tools/twctl/commands/Commands.h"
#include "tools/twctl/completion/Candidate.h"
#include "tools/twctl/completion/CompletionPoint.h"
#include "tools/twctl/completion/CompletionScripts.h"
#include "tools/twctl/completion/ValueSources.h"
#include "tools/twctl/input/Suggestion.h"

namespace tonewerk {
namespace {

constexpr std::string_view kQuestion = "__complete";
constexpr int kFirstWord = 4;  // after the program, __complete, SHELL and SECONDS
constexpr double kMaxSeconds = 3600;

extern "C" void endNow(int /*signal*/) { ::_exit(kDone); }

// Ends the process after these seconds, whatever it waits for: a daemon that hangs, a disk, a lock.
void endAfter(double seconds) {
  struct sigaction action {};
  action.sa_handler = endNow;
  ::sigaction(SIGALRM, &action, nullptr);
  itimerval time{};
  double whole = 0.0;
  const double rest = std::modf(seconds, &whole);
  time.it_value.tv_sec = static_cast<time_t>(whole);
  time.it_value.tv_usec = static_cast<suseconds_t>(rest * 1e6);
  ::setitimer(ITIMER_REAL, &time, nullptr);
}

void print(const Tool& tool, const std::vector<Candidate>& candidates) {
  for (const Candidate& candidate : candidates) tool.out << lineOf(candidate) << '\n';
}

void answerValue(const Tool& tool, const CompletionPoint& point, double seconds) {
  const ValueSources sources = valueSourcesFor(point, tool);
  if (sources.shell != ShellPart::kNone) {
    tool.out << (sources.shell == ShellPart::kFiles ? "files\n" : "recordings\n");
    return;
  }
  const bool goesOn = !sources.known.empty() &&
                      std::all_of(sources.known.begin(), sources.known.end(),
                                  [](const Candidate& candidate) { return candidate.word.ends_with('.'); });
  tool.out << (goesOn ? "words nospace\n" : "words\n");
  print(tool, candidatesOfTree(point));
  print(tool, sources.known);
  tool.out.flush();
  if (!sources.lookup) return;
  endAfter(seconds);
  std::vector<Candidate> found = sources.lookup();
  const auto isKnown = [&](const Candidate& candidate) {
    return std::any_of(sources.known.begin(), sources.known.end(),
                       [&](const Candidate& known) { return known.word == candidate.word; });
  };
  std::erase_if(found, isKnown);
  print(tool, found);
}

int printScript(const Tool& tool, const std::string& shell) {
  if (const auto script = completionScriptFor(shell)) {
    tool.out << *script;
    return kDone;
  }
  const std::vector<std::string> shells(kCompletionShells.begin(), kCompletionShells.end());
  return tool.fail(kWrongUsage, "there is no completion for '" + shell + "'; " + hintFor(shell, shells));
}

}  // namespace

std::optional<CompletionQuestion> CompletionQuestion::read(int argc, const char* const* argv) {
  if (argc < kFirstWord || argv[1] != kQuestion) return std::nullopt;
  const std::string_view seconds = argv[3];
  CompletionQuestion question;
  const auto [rest, error] =
      std::from_chars(seconds.data(), seconds.data() + seconds.size(), question.seconds);
  if (error != std::errc() || rest != seconds.data() + seconds.size()) return std::nullopt;
  if (!(question.seconds > 0.001 && question.seconds <= kMaxSeconds)) return std::nullopt;
  const bool isAsTyped = std::string_view(argv[2]) == "bash";
  for (int at = kFirstWord; at < argc; ++at)
    question.words.push_back(isAsTyped ? unquoted(argv[at]) : std::string(argv[at]));
  return question;
}

void answerCompletion(const CLI::App& app, const Tool& tool, const CompletionQuestion& question) {
  const CompletionPoint point = completionPointOf(app, question.words);
  using Kind = CompletionPoint::Kind;
  switch (point.kind) {
    case Kind::kOption:
    case Kind::kCommand:
      tool.out << "words\n";
      print(tool, candidatesOfTree(point));
      break;
    case Kind::kValue:
    case Kind::kArgument:
      answerValue(tool, point, question.seconds);
      break;
    case Kind::kForeign:
      tool.out << "command " << point.foreignAt + 1 << '\n';
      break;
    case Kind::kNothing:
      tool.out << "words\n";
      break;
  }
  tool.out.flush();
}

void addCompletionCommand(CLI::App& app, Tool& tool) {
  CLI::App& command = addCommand(app, tool, "completion", "Prints what makes a shell complete twctl");
  command.footer(
      "The packages install it for all three shells. From a build of your own:\n"
      "  bash   eval \"$(twctl completion bash)\"             in ~/.bashrc\n"
      "  zsh    eval \"$(twctl completion zsh)\"              in ~/.zshrc, after compinit\n"
      "  fish   twctl completion fish | source              in ~/.config/fish/config.fish\n"
      "The shell then asks twctl, which asks the daemon and reads its files for at most a second.");
  const auto shell = std::make_shared<std::string>();
  command.add_option("SHELL", *shell, "The shell")->required()->type_name("bash|zsh|fish");
  command.callback([&tool, shell] { tool.status = printScript(tool, *shell); });
}

}  // namespace tonewerk
