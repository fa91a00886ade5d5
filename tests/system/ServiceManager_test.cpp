// SPDX-License-Identifier: Apache-2.0
//
// Tests the daemon with the service manager that started it.
#include <csignal>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "support/NotifySocket.h"
#include "system/support/DaemonTest.h"
#include "system/support/StoppedThread.h"

namespace tonewerk {
namespace {

using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr AudioServiceType kTest = 11;
constexpr AudioEventType kMemoryLog = 19;

class ServiceManagerSystemTest : public DaemonTest {
 protected:
  void SetUp() override { daemon.setEnvironment("NOTIFY_SOCKET", manager.path()); }

  NotifySocket manager;
};

TEST_F(ServiceManagerSystemTest, IsToldWhenTheDaemonServesAndWhenItStops) {
  ASSERT_TRUE(daemon.start());
  EXPECT_THAT(manager.waitForLine("READY=1"), HasSubstr("STATUS=Listening on " + daemon.socketPath()));
  EXPECT_TRUE(daemon.accepts());
  EXPECT_EQ(daemon.stop(), 0);
  EXPECT_THAT(manager.waitForLine("STOPPING=1"), HasSubstr("STATUS="));
}

TEST_F(ServiceManagerSystemTest, IsToldOfTheEndByTheKillRequest) {
  ASSERT_TRUE(daemon.start());
  DaemonClient client = connect();
  client.notify("killService", {});
  EXPECT_EQ(daemon.process().wait(), 2);
  EXPECT_THAT(manager.waitForLine("STOPPING=1"), Not(IsEmpty()));
}

TEST_F(ServiceManagerSystemTest, GetsNoPingsThatItDidNotAskFor) {
  ASSERT_TRUE(daemon.start());
  EXPECT_EQ(daemon.stop(), 0);
  for (const std::string& message : manager.take()) EXPECT_THAT(message, Not(HasSubstr("WATCHDOG")));
}

TEST_F(ServiceManagerSystemTest, IsPingedWhileTheWorkQueueIsBlocked) {
  const TemporaryDirectory directory;
  const std::string gate = directory.path("gate");
  ASSERT_EQ(mkfifo(gate.c_str(), 0600), 0);
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.twreporting.toml",
                                        R"(memory_tools = ["cat )" + gate + R"(", "true"])"));
  daemon.setEnvironment("WATCHDOG_USEC", "200000");
  ASSERT_TRUE(daemon.start());
  EXPECT_THAT(manager.waitForLine("READY=1"), Not(IsEmpty()));

  DaemonClient client = connect();
  client.create(77, kTest);
  client.start(77);
  client.request("sendMessage", ReportingClient::messageArguments({{"reason", "test"}}, 1, kMemoryLog, {77}));
  ASSERT_TRUE(waitForLogLine("wiredlog: requesting"));
  {
    // The work queue waits for the tool, which waits for data.
    const FileDescriptor tool(::open(gate.c_str(), O_WRONLY | O_CLOEXEC));
    ASSERT_TRUE(tool);
    manager.take();
    for (int pings = 0; pings < 5; ++pings) EXPECT_EQ(manager.waitForLine("WATCHDOG=1"), "WATCHDOG=1");
    EXPECT_EQ(logLinesWith("request cat", "captured"), 0U);
  }
  EXPECT_TRUE(waitForLogLine("request cat " + gate + " captured"));
}

TEST_F(ServiceManagerSystemTest, IsToldNothingWhileTheWorkQueueHangsAndTheLogNamesIt) {
  daemon.setEnvironment("WATCHDOG_USEC", "400000");
  ASSERT_TRUE(daemon.start());
  EXPECT_THAT(manager.waitForLine("READY=1"), HasSubstr("READY=1"));
  EXPECT_EQ(manager.waitForLine("WATCHDOG=1"), "WATCHDOG=1");
  {
    const StoppedThread workQueue(daemon.process().identifier(), "eporting.server",
                                  StoppedThread::WaitsIn::kFutex);
    daemon.process().signal(SIGUSR1);  // the status is work for it
    ASSERT_TRUE(waitForLogLine("the work queue has made no progress for 0 s"));
    manager.take();
    EXPECT_TRUE(daemon.accepts());  // the messaging thread goes on
    EXPECT_THAT(manager.take(), IsEmpty());
    EXPECT_EQ(logLinesWith("status: clients"), 0U);
  }
  EXPECT_EQ(manager.waitForLine("WATCHDOG=1"), "WATCHDOG=1");
  EXPECT_TRUE(waitForLogLine("the work queue makes progress again"));
  EXPECT_TRUE(waitForLogLine("status: clients"));
}

TEST_F(ServiceManagerSystemTest, IsToldNothingWhileTheMessagingThreadHangs) {
  daemon.setEnvironment("WATCHDOG_USEC", "200000");
  ASSERT_TRUE(daemon.start());
  EXPECT_THAT(manager.waitForLine("READY=1"), HasSubstr("READY=1"));
  EXPECT_EQ(manager.waitForLine("WATCHDOG=1"), "WATCHDOG=1");
  {
    const StoppedThread messaging(daemon.process().identifier(), "tw-messaging",
                                  StoppedThread::WaitsIn::kEpoll);
    manager.take();
    daemon.process().signal(SIGUSR1);
    EXPECT_TRUE(waitForLogLine("status: clients"));  // the others go on
    EXPECT_THAT(manager.take(), IsEmpty());
  }
  EXPECT_EQ(manager.waitForLine("WATCHDOG=1"), "WATCHDOG=1");
}

}  // namespace
}  // namespace tonewerk
