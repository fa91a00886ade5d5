// SPDX-License-Identifier: Apache-2.0
//
// Tests the separation of users over D-Bus, on a bus of the test's own that lets every user in.
#include <list>
#include <memory>
#include <string>

#include "platform/linux/dbus/DbusCaller.h"
#include "platform/linux/dbus/DbusService.h"
#include "platform/linux/dbus/PrivateBus.h"
#include "support/OtherUser.h"
#include "system/support/UsersTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::UnorderedElementsAre;

const DbusNames kNames{"com.orvane.tonewerk.reporting", "/com/orvane/tonewerk/reporting",
                       "com.orvane.tonewerk.TWReportingServiceProtocol"};
// A bus lets in only users of the system's user database. Every system has these two: daemon and nobody.
constexpr std::uint32_t kFirstUser = 1;
constexpr std::uint32_t kSecondUser = kOtherUser;
constexpr int kTelephony = 2;
constexpr int kLongFormAudio = 7;

class BusUsersTest : public UsersTest {
 protected:
  void SetUp() override {
    UsersTest::SetUp();
    if (IsSkipped()) return;
    ASSERT_TRUE(bus.isRunning()) << "dbus-daemon does not run";
    const std::string address = bus.address();
    openToAllUsers(address.substr(address.find('/')));
    daemon.setEnvironment("DBUS_SESSION_BUS_ADDRESS", address);
    daemon.setEnvironment("TONEWERK_LOG", "info");
  }
  [[nodiscard]] bool startOnBus() {
    return startDaemon() && waitForLogLine("serving com.orvane.tonewerk.reporting on D-Bus");
  }

  std::unique_ptr<DbusCaller> callerAs(std::uint32_t user) {
    std::unique_ptr<DbusCaller> caller;
    // The first call is made on the same thread, because only then the bus has accepted the caller.
    runAsUser(user, [&] {
      caller = std::make_unique<DbusCaller>(bus.address(), kNames);
      caller->uniqueName();
    });
    return caller;
  }
  static void create(DbusCaller& caller, std::int64_t reporterID, int service) {
    EXPECT_TRUE(caller.ask("CreateReportingSession", "x", reporterID).boolean());
    EXPECT_TRUE(caller.ask("SetServiceType", "qx", service, reporterID).boolean());
  }
  static int serviceType(DbusCaller& caller, std::int64_t reporterID) {
    return caller.ask("GetServiceNameForReporterID", "x", reporterID).uint16();
  }

  PrivateBus bus{"<policy context=\"default\"><allow user=\"*\"/></policy>"};
};

TEST_F(BusUsersTest, ListsAndQuestionsShowAUserItsOwnSessionsAndRootAll) {
  ASSERT_TRUE(startOnBus());
  const auto alice = callerAs(kFirstUser);
  const auto bob = callerAs(kSecondUser);
  const auto root = callerAs(0);
  create(*bob, 77, kTelephony);
  create(*alice, 77, kLongFormAudio);
  create(*alice, 78, kLongFormAudio);
  EXPECT_EQ(serviceType(*bob, 77), kTelephony);
  EXPECT_EQ(serviceType(*alice, 77), kLongFormAudio);
  EXPECT_EQ(serviceType(*bob, 78), 65'535);
  EXPECT_THAT(alice->ask("GetAllReporters").int64List(), UnorderedElementsAre(77, 78));
  EXPECT_THAT(bob->ask("GetAllReporters").int64List(), ElementsAre(77));
  EXPECT_THAT(root->ask("GetAllReporters").int64List(), UnorderedElementsAre(77, 77, 78));
}

TEST_F(BusUsersTest, AUsersSessionsAreTheSameOnBothWays) {
  ASSERT_TRUE(startOnBus());
  const auto alice = callerAs(kFirstUser);
  create(*alice, 77, kLongFormAudio);
  DaemonClient overSocket = connectAs(kFirstUser);
  EXPECT_EQ(overSocket.serviceType(77), kLongFormAudio);
  DaemonClient bob = connectAs(kSecondUser);
  EXPECT_THAT(bob.allReporters(), IsEmpty());
}

TEST_F(BusUsersTest, OnlyATrustedUserMayEndTheDaemon) {
  ASSERT_TRUE(startOnBus());
  const auto alice = callerAs(kFirstUser);
  EXPECT_EQ(alice->ask("KillService").error, SD_BUS_ERROR_ACCESS_DENIED);
  EXPECT_THAT(alice->ask("GetAllReporters").int64List(), IsEmpty());
  EXPECT_TRUE(daemon.process().isRunning());
  const auto root = callerAs(0);
  EXPECT_EQ(root->ask("KillService").error, SD_BUS_ERROR_NO_REPLY);
  EXPECT_EQ(daemon.process().wait(), 2);
}

TEST_F(BusUsersTest, AUserThatTakesAllPlacesLeavesOneForTheNext) {
  ASSERT_TRUE(startOnBus());
  std::list<std::unique_ptr<DbusCaller>> all;
  bool isRefused = false;
  for (std::size_t at = 0; at <= DbusService::kMaxClients && !isRefused; ++at) {
    all.push_back(callerAs(kSecondUser));
    isRefused = !all.back()->ask("CreateReportingSession", "x", std::int64_t{1}).error.empty();
  }
  EXPECT_TRUE(isRefused);
  const auto alice = callerAs(kFirstUser);
  create(*alice, 77, kLongFormAudio);
  EXPECT_EQ(serviceType(*alice, 77), kLongFormAudio);
  EXPECT_EQ(all.front()->ask("GetAllReporters").error, "");  // those who came before are still served
}

}  // namespace
}  // namespace tonewerk
