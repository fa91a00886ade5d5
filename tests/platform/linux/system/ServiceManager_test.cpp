// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/ServiceManager.h"

#include <cstdlib>
#include <ctime>
#include <gmock/gmock.h>
#include <string>
#include <unistd.h>
#include <vector>

#include "support/NotifySocket.h"

namespace tonewerk {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;

class ServiceManagerTest : public testing::Test {
 protected:
  void SetUp() override { clearVariables(); }
  void TearDown() override { clearVariables(); }

  static void clearVariables() {
    for (const char* name : {"NOTIFY_SOCKET", "WATCHDOG_USEC", "WATCHDOG_PID"}) unsetenv(name);
  }
  static void set(const char* name, const std::string& value) { setenv(name, value.c_str(), 1); }

  NotifySocket socket;
  const ServiceManager manager{};
};

TEST_F(ServiceManagerTest, IsToldWhenClientsAreServedAndWhenTheEndBegins) {
  set("NOTIFY_SOCKET", socket.path());
  manager.tellReady("Listening on /run/a.sock");
  manager.tellStopping("Finishing");
  EXPECT_THAT(socket.take(),
              ElementsAre("READY=1\nSTATUS=Listening on /run/a.sock", "STOPPING=1\nSTATUS=Finishing"));
}

TEST_F(ServiceManagerTest, IsPinged) {
  set("NOTIFY_SOCKET", socket.path());
  manager.ping();
  manager.ping();
  EXPECT_THAT(socket.take(), ElementsAre("WATCHDOG=1", "WATCHDOG=1"));
}

TEST_F(ServiceManagerTest, TheWatchdogIsSwitchedOffWhenTheEndBegins) {
  set("NOTIFY_SOCKET", socket.path());
  set("WATCHDOG_USEC", "1000000");
  manager.tellStopping("Finishing");
  EXPECT_THAT(socket.take(), ElementsAre("STOPPING=1\nWATCHDOG_USEC=0\nSTATUS=Finishing"));
}

TEST_F(ServiceManagerTest, WithoutTheVariableNothingIsSent) {
  manager.tellReady("Listening");
  manager.ping();
  manager.tellStopping("Finishing");
  EXPECT_THAT(socket.take(), IsEmpty());
  EXPECT_EQ(manager.pingInterval(), std::nullopt);
}

TEST_F(ServiceManagerTest, AMissingSocketDoesNoHarm) {
  set("NOTIFY_SOCKET", "/nowhere/notify");
  manager.tellReady("Listening");
  manager.ping();
  set("NOTIFY_SOCKET", socket.path());
  manager.ping();
  EXPECT_THAT(socket.take(), ElementsAre("WATCHDOG=1"));
}

TEST_F(ServiceManagerTest, WantsAPingInHalfItsTimeOut) {
  set("WATCHDOG_USEC", "30000000");
  EXPECT_EQ(manager.pingInterval(), 15s);
  set("WATCHDOG_PID", std::to_string(getpid()));
  EXPECT_EQ(manager.pingInterval(), 15s);
}

TEST_F(ServiceManagerTest, WantsNoPingsOfAnotherProcess) {
  set("WATCHDOG_USEC", "30000000");
  set("WATCHDOG_PID", std::to_string(getppid()));
  EXPECT_EQ(manager.pingInterval(), std::nullopt);
}

TEST_F(ServiceManagerTest, AnInvalidTimeoutMeansNoPings) {
  for (const char* wrong : {"", "0", "-1", "soon", "18446744073709551615"}) {
    set("WATCHDOG_USEC", wrong);
    EXPECT_EQ(manager.pingInterval(), std::nullopt) << wrong;
  }
}

TEST_F(ServiceManagerTest, ThePingIntervalIsLimited) {
  set("WATCHDOG_USEC", "1");
  EXPECT_EQ(manager.pingInterval(), 1ms);
  set("WATCHDOG_USEC", "18446744073709551613");
  EXPECT_EQ(manager.pingInterval(), 1h);
}

TEST_F(ServiceManagerTest, IsToldThatTheConfigurationIsReadAgainAndSinceWhen) {
  set("NOTIFY_SOCKET", socket.path());
  timespec before{};
  ASSERT_EQ(clock_gettime(CLOCK_MONOTONIC, &before), 0);
  manager.tellReloading();
  manager.tellReady("Listening");
  const std::vector<std::string> told = socket.take();
  ASSERT_EQ(told.size(), 2U);
  const std::string kLine = "RELOADING=1\nMONOTONIC_USEC=";
  ASSERT_EQ(told[0].substr(0, kLine.size()), kLine);
  EXPECT_GE(std::stoll(told[0].substr(kLine.size())), before.tv_sec * 1'000'000LL);
  EXPECT_LT(std::stoll(told[0].substr(kLine.size())), (before.tv_sec + 60) * 1'000'000LL);
  EXPECT_EQ(told[1], "READY=1\nSTATUS=Listening");
}

}  // namespace
}  // namespace tonewerk
