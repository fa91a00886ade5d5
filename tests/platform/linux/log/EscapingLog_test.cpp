// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/log/EscapingLog.h"

#include <gmock/gmock.h>
#include <memory>
#include <string>

#include "platform/LogLines.h"
#include "platform/linux/log/StreamLog.h"
#include "support/ForwardingLog.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;

class EscapingLogTest : public ::testing::Test {
 protected:
  void write(const std::string& message) {
    log.write("com.orvane.tonewerk", "twrs", LogLevel::kError, message);
  }

  MemoryLog inner;
  EscapingLog log{std::make_unique<ForwardingLog>(inner)};
};

TEST_F(EscapingLogTest, PassesOrdinaryLinesOnUnchanged) {
  write("Überlauf \\n {\"a\":1}");
  EXPECT_THAT(inner.lines(), ElementsAre(MemoryLog::Line{"com.orvane.tonewerk", "twrs", LogLevel::kError,
                                                         "Überlauf \\n {\"a\":1}"}));
}

TEST_F(EscapingLogTest, NoTextFromAClientBeginsALine) {
  const std::string forged = "a\n" + StreamLog::format(0, "twrs", LogLevel::kError, "killed by root");
  write("unknown session " + forged);
  EXPECT_THAT(inner.textsOf("twrs"),
              ElementsAre("unknown session a\\n1970-01-01T00:00:00.000000Z error twrs killed by root\\n"));
}

TEST_F(EscapingLogTest, NoTextFromAClientControlsATerminal) {
  write(
      "\x1b[2J \xC2\x9B"
      "2J \x7F \xE2\x80\xAE \xE2\x80\xA8");
  EXPECT_THAT(inner.textsOf("twrs"), ElementsAre(R"(\u001b[2J \u009b2J \u007f \u202e \u2028)"));
}

TEST_F(EscapingLogTest, KeepsTheLinesThatTheDaemonHasCollected) {
  {
    const LogLines lines;
    write("BLOCK 1\nfirst\x1b\nsecond\n");
  }
  write("a\nb");
  EXPECT_THAT(inner.textsOf("twrs"), ElementsAre("BLOCK 1\nfirst\\u001b\nsecond\n", "a\\nb"));
}

TEST_F(EscapingLogTest, IsEnabledLikeTheLogBehindIt) {
  inner.setThreshold(LogLevel::kError);
  EXPECT_FALSE(log.isEnabled("twrs", LogLevel::kInfo));
  EXPECT_TRUE(log.isEnabled("twrs", LogLevel::kError));
}

}  // namespace
}  // namespace tonewerk
