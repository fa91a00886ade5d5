// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/DiagnosticSummary.h"

#include <cstddef>
#include <gtest/gtest.h>
#include <string>

namespace tonewerk {
namespace {

std::string requestNested(std::size_t levels) {
  return "{\"payload\":" + std::string(levels - 1, '[') + std::string(levels - 1, ']') + "}";
}

TEST(DiagnosticSummaryTest, ShowsValuesThatNestAsDeepAsItemsMay) {
  const std::string request = requestNested(200);
  const auto summary = DiagnosticSummary::read(DiagnosticKind::kCapture, request);
  ASSERT_TRUE(summary);
  EXPECT_EQ(summary->payload, std::string(199, '[') + std::string(199, ']'));
  EXPECT_EQ(compactJson(request), request);
}

// The JSON library writes values recursively: a file of some ten thousand brackets ended the tool.
TEST(DiagnosticSummaryTest, ARequestThatNestsDeeperIsNotRead) {
  for (const std::size_t levels : {201U, 100'000U}) {
    const std::string request = requestNested(levels);
    EXPECT_FALSE(DiagnosticSummary::read(DiagnosticKind::kCapture, request)) << levels;
    EXPECT_EQ(compactJson(request), "null") << levels;
  }
}

}  // namespace
}  // namespace tonewerk
