// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/OtlpAnswer.h"

#include <gtest/gtest.h>

namespace tonewerk {
namespace {

TEST(OtlpAnswerTest, AnEmptyOneAcceptsEverything) {
  for (const char* body : {"", "{}", R"({"partialSuccess":{}})"}) {
    const auto answer = parseOtlpAnswer(body);
    ASSERT_TRUE(answer) << body;
    EXPECT_EQ(answer->rejectedRecords, 0);
    EXPECT_EQ(answer->message, "");
  }
}

TEST(OtlpAnswerTest, SaysHowManyRecordsWereRejectedAndWhy) {
  for (const char* count : {"\"3\"", "3"}) {
    const auto answer = parseOtlpAnswer(R"({"partialSuccess":{"rejectedLogRecords":)" + std::string(count) +
                                        R"(,"errorMessage":"too old"}})");
    ASSERT_TRUE(answer);
    EXPECT_EQ(answer->rejectedRecords, 3);
    EXPECT_EQ(answer->message, "too old");
  }
}

TEST(OtlpAnswerTest, RefusesOtherJson) {
  for (const char* body :
       {"no", "[]", "3", R"({"partialSuccess":1})", R"({"partialSuccess":{"errorMessage":1}})",
        R"({"partialSuccess":{"rejectedLogRecords":"3x"}})",
        R"({"partialSuccess":{"rejectedLogRecords":99999999999999999999}})"}) {
    EXPECT_EQ(parseOtlpAnswer(body), std::nullopt) << body;
  }
  EXPECT_EQ(parseOtlpAnswer(std::string(60'000, '[')), std::nullopt);
}

TEST(QuotableTest, CannotForgeALogLine) {
  EXPECT_EQ(quotable("a\nb\x1b[0m\xc3\xa4"), "a?b?[0m??");
  EXPECT_EQ(quotable(std::string(1000, 'x')).size(), 200U);
}

}  // namespace
}  // namespace tonewerk
