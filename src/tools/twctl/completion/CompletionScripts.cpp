// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/completion/CompletionScripts.h"

#include <cstddef>

// The assembler puts the files into the program. CMake makes this source depend on them.
#define TONEWERK_SCRIPT(NAME)                                                                    \
  asm(".pushsection .rodata\n"                                                                   \
      ".global tonewerk_completion_" #NAME "\n.hidden tonewerk_completion_" #NAME                \
      "\n"                                                                                       \
      "tonewerk_completion_" #NAME ":\n.incbin \"" TONEWERK_COMPLETION_DIRECTORY "/twctl." #NAME \
      "\"\n"                                                                                     \
      ".global tonewerk_completion_" #NAME "_end\n.hidden tonewerk_completion_" #NAME            \
      "_end\n"                                                                                   \
      "tonewerk_completion_" #NAME "_end:\n.byte 0\n.popsection\n");                             \
  extern "C" {                                                                                   \
  extern const char tonewerk_completion_##NAME[];                                                \
  extern const char tonewerk_completion_##NAME##_end[];                                          \
  }

TONEWERK_SCRIPT(bash)
TONEWERK_SCRIPT(zsh)
TONEWERK_SCRIPT(fish)

namespace tonewerk {
namespace {

std::string_view between(const char* begin, const char* end) {
  return {begin, static_cast<std::size_t>(end - begin)};
}

}  // namespace

std::optional<std::string_view> completionScriptFor(std::string_view shell) {
  if (shell == "bash") return between(tonewerk_completion_bash, tonewerk_completion_bash_end);
  if (shell == "zsh") return between(tonewerk_completion_zsh, tonewerk_completion_zsh_end);
  if (shell == "fish") return between(tonewerk_completion_fish, tonewerk_completion_fish_end);
  return std::nullopt;
}

}  // namespace tonewerk
