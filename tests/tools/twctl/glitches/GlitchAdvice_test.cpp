// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/glitches/GlitchAdvice.h"

#include <gmock/gmock.h>
#include <set>
#include <string>

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

GlitchVerdict verdictOf(const char* cause) {
  GlitchVerdict verdict;
  verdict.id = "1-1";
  verdict.cause = "waiting for another";
  verdict.firstCause = cause;
  verdict.culpritApplication = "org.example.Studio";
  verdict.culpritProcess = "studio";
  verdict.culpritPid = 4711;
  verdict.node = "player";
  verdict.overMs = 3.0672;
  verdict.periodMs = 5.3333;
  verdict.quantum = 256;
  return verdict;
}

TEST(GlitchAdviceTest, EachCauseHasAMeaningAndARemedyOfItsOwn) {
  std::set<std::string> meanings;
  std::set<std::string> remedies;
  constexpr const char* kCauses[] = {"late",   "not scheduled", "stuck",        "waiting for another",
                                     "device", "graph changed", "system slept", "a cause of a later version"};
  for (const char* cause : kCauses) {
    meanings.insert(meaningOf(verdictOf(cause)));
    ASSERT_THAT(remediesFor(verdictOf(cause)), Not(IsEmpty())) << cause;
    remedies.insert(remediesFor(verdictOf(cause)).front());
  }
  EXPECT_EQ(meanings.size(), std::size(kCauses));
  EXPECT_EQ(remedies.size(), std::size(kCauses));
}

TEST(GlitchAdviceTest, SaysWhoWasLateAndByHowMuch) {
  EXPECT_EQ(meaningOf(verdictOf("late")),
            "org.example.Studio computed longer than the cycle of 5.33 ms lasts, by at least 3.07 ms.");
  EXPECT_THAT(remediesFor(verdictOf("late"))[1], HasSubstr("clock.min-quantum 512`"));
}

TEST(GlitchAdviceTest, BlamesWhoHeldTheProcessorAndNotTheVictim) {
  EXPECT_EQ(meaningOf(verdictOf("not scheduled")),
            "player was ready to compute, but got no processor in time, by at least 3.07 ms.");
  EXPECT_THAT(remediesFor(verdictOf("not scheduled"))[0], HasSubstr("studio"));
  EXPECT_THAT(remediesFor(verdictOf("not scheduled"))[0], HasSubstr("renice -n 19 -p 4711"));
}

TEST(GlitchAdviceTest, LooksIntoTheKernelsLogAtTheTimeOfTheGlitch) {
  GlitchVerdict verdict = verdictOf("device");
  verdict.at = 1'795'132'920.5;
  EXPECT_THAT(remediesFor(verdict)[0], HasSubstr("journalctl -k --since @1795132915 --until @1795132925`"));
}

TEST(GlitchAdviceTest, KnowsWhatToDoWithoutNamesAndFigures) {
  for (const char* cause : {"late", "not scheduled", "stuck", "device", "unheard of"}) {
    GlitchVerdict verdict;
    verdict.firstCause = cause;
    EXPECT_THAT(meaningOf(verdict), Not(IsEmpty()));
    EXPECT_THAT(remediesFor(verdict), Not(IsEmpty()));
  }
  EXPECT_THAT(remediesFor(GlitchVerdict())[0], HasSubstr("tw-pipewire"));
}

}  // namespace
}  // namespace tonewerk
