// SPDX-License-Identifier: Apache-2.0
//
// The daemon as a process: what it makes when it starts, where, and who may listen.
#include <filesystem>
#include <gmock/gmock.h>

#include "client/ReportingClient.h"
#include "system/support/DaemonProcess.h"

namespace tonewerk {
namespace {

TEST(DaemonStartTest, AnswersAClientAndEndsWithStatusZeroOnSigterm) {
  DaemonProcess daemon;
  ASSERT_TRUE(daemon.start());
  ReportingClient client;
  ASSERT_FALSE(client.connect({daemon.socketPath()}));
  std::error_code error;
  const std::optional<Answer> answer = client.call("getAllReporters", {}, kSystemPatience, error);
  ASSERT_TRUE(answer) << error.message();
  EXPECT_EQ(answer->result, Value(ValueArray()));
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_FALSE(std::filesystem::exists(daemon.socketPath()));
}

}  // namespace
}  // namespace tonewerk
