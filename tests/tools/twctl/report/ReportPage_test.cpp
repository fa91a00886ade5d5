// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/report/ReportPage.h"

#include <algorithm>
#include <cctype>
#include <cstddef>
#include <gmock/gmock.h>
#include <string>

#include "values/Value.h"

namespace tonewerk {
namespace {

using testing::HasSubstr;
using testing::Not;

std::size_t countOf(const std::string& text, const std::string& what) {
  std::size_t count = 0;
  for (std::size_t at = text.find(what); at != std::string::npos; at = text.find(what, at + 1)) ++count;
  return count;
}

TEST(ReportPageTest, NoTextOfAClientEndsTheScriptElement) {
  const std::string plain = reportPage({{"name", "Melody"}}, "n");
  const std::string page =
      reportPage({{"name", "</script><script>alert(1)</script><!--{{nonce}}{{data}}"}}, "n");
  EXPECT_THAT(page, Not(HasSubstr("<script>alert")));
  EXPECT_THAT(page,
              HasSubstr(R"("\u003c/script>\u003cscript>alert(1)\u003c/script>\u003c!--{{nonce}}{{data}}")"));
  EXPECT_EQ(countOf(page, "</script"), countOf(plain, "</script"));
}

TEST(ReportPageTest, OnlyScriptsWithTheNonceRun) {
  const std::string page = reportPage({}, "abc123");
  EXPECT_THAT(page, HasSubstr("default-src 'none'; script-src 'nonce-abc123'; "));
  EXPECT_EQ(countOf(page, "<script"), 3U);
  EXPECT_EQ(countOf(page, "<script nonce=\"abc123\">"), 2U);
  EXPECT_THAT(page, HasSubstr("<script type=\"application/json\" id=\"data\">{}</script>"));
}

TEST(ReportPageTest, EachPageHasANonceOfItsOwn) {
  EXPECT_NE(newNonce(), newNonce());
  const std::string nonce = newNonce();
  EXPECT_EQ(nonce.size(), 24U);
  EXPECT_TRUE(std::all_of(nonce.begin(), nonce.end(), [](char c) { return std::isalnum(c) != 0; })) << nonce;
}

TEST(ReportPageTest, NeedsNothingFromAnywhereElse) {
  const std::string page = reportPage({}, "n");
  EXPECT_THAT(page, Not(HasSubstr("{{")));
  for (const char* part : {"<img", "<link", "<iframe", "<object", "<embed", "<base", "src=\"", "href=\""}) {
    EXPECT_EQ(countOf(page, part), 0U) << part;
  }
  EXPECT_THAT(page, Not(HasSubstr("@import")));
}

TEST(ReportPageTest, CarriesTheLicencesOfTheChartLibraries) {
  const std::string page = reportPage({}, "n");
  EXPECT_THAT(page, HasSubstr("Permission to use, copy, modify, and/or distribute this software"));
  EXPECT_THAT(page, HasSubstr("@observablehq/plot 0."));
}

}  // namespace
}  // namespace tonewerk
