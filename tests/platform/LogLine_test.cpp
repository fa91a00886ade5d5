// SPDX-License-Identifier: Apache-2.0
#include "platform/LogLine.h"

#include <gmock/gmock.h>

#include <string>
#include <string_view>

#include "platform/LogCategory.h"
#include "support/MemoryLog.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;

// A std::string converts to a string_view and to a Value alike; it used to be printed as a list of its characters.
TEST(LogLineTest, ShowsEveryKindOfTextAsItIs) {
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  const char* const pointer = "d";
  errorLog(category, "%s %s %s %s %@", std::string("a"), std::string_view("b"), "c", pointer, SharedString("e"));
  EXPECT_THAT(log.textsOf("twrs"), ElementsAre("a b c d e"));
}

}  // namespace
}  // namespace tonewerk
