// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/ShellWord.h"

#include <gmock/gmock.h>
#include <stdio.h>

namespace tonewerk {
namespace {

// What a shell makes of the words.
std::string printedByShell(const std::string& words) {
  FILE* shell = ::popen(("printf '[%s]' " + words).c_str(), "r");
  std::string text;
  for (int letter = ::fgetc(shell); letter != EOF; letter = ::fgetc(shell)) text += static_cast<char>(letter);
  ::pclose(shell);
  return text;
}

TEST(ShellWordTest, LeavesOrdinaryPathsAsTheyAre) {
  EXPECT_EQ(shellWord("/home/tom/.local/state/tonewerk"), "/home/tom/.local/state/tonewerk");
  EXPECT_EQ(shellWord("https://host.example:4318/v1"), "https://host.example:4318/v1");
  EXPECT_EQ(shellWord("256"), "256");
}

TEST(ShellWordTest, AShellReadsTheTextAsOneWord) {
  for (const std::string text : {"", " ", "a b", "a'b", "''", "$HOME", "`id`", "a\\b", "a\"b", "*", "~",
                                 "a;b", "a\nb", "#a", "a&b", "{a,b}", "!!", "Musik für alle"}) {
    EXPECT_EQ(printedByShell(shellWord(text)), "[" + text + "]");
  }
}

}  // namespace
}  // namespace tonewerk
