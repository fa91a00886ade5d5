// SPDX-License-Identifier: Apache-2.0
#include "platform/JournalProcess.h"

#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::Optional;

TEST(JournalProcessTest, AProcessIsReadAsItWasWritten) {
  for (const JournalProcess& process : {JournalProcess{11, "player"}, JournalProcess{12, "two words"},
                                        JournalProcess{13, ""}, JournalProcess{14, std::nullopt}}) {
    EXPECT_THAT(decodedJournalProcess(encoded(process)), Optional(process));
  }
}

TEST(JournalProcessTest, OtherBytesAreNoProcess) {
  for (const char* wrong : {"", "player", "11player", "99999999999999"}) {
    EXPECT_FALSE(decodedJournalProcess(wrong)) << wrong;
  }
}

}  // namespace
}  // namespace tonewerk
