// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/health/Findings.h"

#include <gmock/gmock.h>
#include <set>

namespace tonewerk {
namespace {

TEST(FindingsTest, EachKindHasANameOfItsOwnAndIsWhole) {
  std::set<std::string_view> names;
  for (const FindingKind& kind : findingKinds()) {
    EXPECT_TRUE(names.insert(kind.name).second) << kind.name;
    EXPECT_FALSE(kind.cause.empty() || kind.why.empty() || kind.remedy.empty()) << kind.name;
    EXPECT_EQ(kind.name.find_first_not_of("abcdefghijklmnopqrstuvwxyz-"), std::string_view::npos)
        << kind.name;
  }
}

TEST(FindingsTest, WhatCannotBeSeenIsSaidOnce) {
  Findings findings;
  findings.couldNotSee("a");
  findings.couldNotSee("b");
  findings.couldNotSee("a");
  EXPECT_THAT(findings.unseen(), testing::ElementsAre("a", "b"));
}

TEST(FindingsTest, AFindingHasItsOwnRemedyOrThatOfItsKind) {
  Findings findings;
  findings.add("no-daemon", "there is none");
  findings.add("no-daemon", "there is none", "start it");
  ASSERT_EQ(findings.all().size(), 2U);
  EXPECT_EQ(findings.all()[0].remedy, findings.all()[0].kind->remedy);
  EXPECT_EQ(findings.all()[1].remedy, "start it");
}

}  // namespace
}  // namespace tonewerk
