// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/completion/Candidate.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

TEST(CandidateTest, WordsThatControlATerminalOrLookLikeOptionsAreNotOffered) {
  for (const char* word : {"PCH", "Amp Drv<0x1>", "$(touch hit)", "-12", "\xC3\xBC"})
    EXPECT_TRUE(isOfferable(word)) << word;
  for (const char* word :
       {"", "a\x1b[2J", "a\nb", "a\tb", "\xC2\x9B", "\xE2\x80\xAE", "-", "-x", "--system", "-1x"})
    EXPECT_FALSE(isOfferable(word)) << word;
  EXPECT_TRUE(isOfferable(std::string(255, 'x')));
  EXPECT_FALSE(isOfferable(std::string(256, 'x')));
}

TEST(CandidateTest, ADescriptionIsEscapedAndCutBetweenCharacters) {
  EXPECT_EQ(lineOf({"word"}), "word");
  EXPECT_EQ(lineOf({"word", "what\tit\nis"}), "word\twhat\\tit\\nis");
  std::string letters;
  for (int at = 0; at < 60; ++at) letters += "\xC3\xBC";
  EXPECT_EQ(lineOf({"word", letters}), "word\t" + letters.substr(0, 100) + "\xE2\x80\xA6");
}

TEST(CandidateTest, QuotesAndBackslashesOfBashAreTakenOffAndNothingIsExpanded) {
  EXPECT_EQ(unquoted("plain"), "plain");
  EXPECT_EQ(unquoted(""), "");
  EXPECT_EQ(unquoted("'a b'c\"d e\""), "a bcd e");
  EXPECT_EQ(unquoted("'it is op"), "it is op");
  EXPECT_EQ(unquoted(R"(a\ b\$c)"), "a b$c");
  EXPECT_EQ(unquoted(R"("a\$b\c\"d")"), R"(a$b\c"d)");
  EXPECT_EQ(unquoted(R"('a\b')"), R"(a\b)");
  EXPECT_EQ(unquoted("ends\\"), "ends");
  EXPECT_EQ(unquoted("$HOME$(touch hit)"), "$HOME$(touch hit)");
}

}  // namespace
}  // namespace tonewerk
