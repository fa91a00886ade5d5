// SPDX-License-Identifier: Apache-2.0
#include <filesystem>
#include <string>

#include "tools/twctl/health/CheckupTest.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

class DaemonChecksTest : public CheckupTest {
 protected:
  void loseDaemon(std::errc error) {
    checkup.daemon = {};
    connecting = std::make_error_code(error);
  }
};

TEST_F(DaemonChecksTest, FindNothingWhereADaemonAnswers) {
  EXPECT_THAT(find(checkSocket), IsEmpty());
  EXPECT_THAT(find(checkDaemon), IsEmpty());
  EXPECT_THAT(find(checkUnits), IsEmpty());
  EXPECT_THAT(find(checkBridge), IsEmpty());
}

TEST_F(DaemonChecksTest, FindThatThereIsNoSocket) {
  loseDaemon(std::errc::no_such_file_or_directory);
  EXPECT_THAT(find(checkSocket), ElementsAre("no-daemon: there is no socket at " + checkup.sockets[0]));
  EXPECT_THAT(remedies, ElementsAre("systemctl --user start twreportingd.socket, or start twreportingd"));
  checkup.isSystemWide = true;
  (void)find(checkSocket);
  EXPECT_THAT(remedies, ElementsAre("sudo systemctl start twreportingd.socket, or start twreportingd"));
}

TEST_F(DaemonChecksTest, FindASocketWhoseDaemonHasDied) {
  loseDaemon(std::errc::connection_refused);
  EXPECT_THAT(find(checkSocket), ElementsAre("dead-socket: " + checkup.sockets[0] + ": Connection refused"));
}

TEST_F(DaemonChecksTest, FindThatTheCallerIsNotInTheGroupOfTheSocket) {
  write("runtime/reporting.sock", "");
  allow("runtime/reporting.sock", 0660);
  checkup.around.groups = {};
  loseDaemon(std::errc::permission_denied);
  EXPECT_THAT(find(checkSocket), ElementsAre("forbidden-socket: " + checkup.sockets[0] +
                                             " is for the group audio, and you are not in it"));
  EXPECT_THAT(remedies, ElementsAre("sudo usermod -aG audio $USER, and log in again"));
  isMember = true;
  EXPECT_THAT(find(checkSocket), ElementsAre(StartsWith("old-login: ")));
  isMember = false;
  checkup.around.groupName = [](gid_t) { return "root"; };
  EXPECT_THAT(find(checkSocket), ElementsAre(StartsWith("forbidden-socket: ")));
  EXPECT_THAT(remedies, ElementsAre(testing::Not(HasSubstr("usermod")))) << "nobody is told to become root";
}

TEST_F(DaemonChecksTest, FindAVariableThatLeadsAwayFromTheDaemon) {
  environment["TONEWERK_REPORTING_SOCKET"] = "/nowhere/reporting.sock";
  EXPECT_THAT(find(checkSocket), IsEmpty()) << "a daemon answers there";
  loseDaemon(std::errc::no_such_file_or_directory);
  EXPECT_THAT(find(checkSocket),
              ElementsAre(StartsWith("no-daemon: "),
                          "other-socket: TONEWERK_REPORTING_SOCKET is set to /nowhere/reporting.sock"));
  EXPECT_EQ(remedies[1], "unset TONEWERK_REPORTING_SOCKET");
}

TEST_F(DaemonChecksTest, FindASocketThatIsOpenToEverybody) {
  write("runtime/reporting.sock", "");
  allow("runtime/reporting.sock", 0660);
  EXPECT_THAT(find(checkSocket), IsEmpty());
  allow("runtime/reporting.sock", 0666);
  EXPECT_THAT(find(checkSocket), ElementsAre(StartsWith("open-socket: ")));
}

TEST_F(DaemonChecksTest, FindADaemonThatDoesNotAnswer) {
  checkup.daemon.answers = false;
  checkup.daemon.problem = "the daemon does not answer (Connection timed out)";
  EXPECT_THAT(find(checkDaemon), ElementsAre("silent-daemon: " + checkup.daemon.problem));
}

TEST_F(DaemonChecksTest, FindADaemonOfAnotherVersion) {
  checkup.ownVersion = "1.1";
  EXPECT_THAT(find(checkDaemon), ElementsAre("other-version: the daemon has the version 1.0, twctl 1.1"));
  EXPECT_THAT(remedies, ElementsAre("systemctl --user restart twreportingd.service"));
  checkup.daemon.daemon.set("state", directory.path("state"));
  (void)find(checkDaemon);
  EXPECT_THAT(remedies, ElementsAre(StartsWith("twctl kill"))) << "it is no unit's";
  checkup.daemon.daemon = {};
  EXPECT_THAT(find(checkDaemon), ElementsAre(HasSubstr("of an older release")));
}

TEST_F(DaemonChecksTest, FindUnitsThatHaveFailed) {
  units =
      "Id=twreportingd.socket\nLoadState=loaded\nActiveState=active\n\n"
      "Id=twreportingd.service\nLoadState=loaded\nActiveState=failed\nResult=exit-code\n";
  EXPECT_THAT(find(checkUnits), ElementsAre("failed-unit: twreportingd.service has failed (exit-code)"));
  EXPECT_THAT(remedies,
              ElementsAre("systemctl --user reset-failed twreportingd.service; systemctl --user start "
                          "twreportingd.service"));
}

TEST_F(DaemonChecksTest, FindThatTheSocketsUnitDoesNotRun) {
  units = "Id=twreportingd.socket\nLoadState=loaded\nActiveState=inactive\n";
  EXPECT_THAT(find(checkUnits), IsEmpty()) << "a daemon runs without it";
  loseDaemon(std::errc::no_such_file_or_directory);
  EXPECT_THAT(find(checkUnits), ElementsAre(StartsWith("stopped-socket: ")));
  units = "Id=twreportingd.socket\nLoadState=not-found\nActiveState=inactive\n";
  EXPECT_THAT(find(checkUnits), IsEmpty()) << "no units are installed";
}

TEST_F(DaemonChecksTest, SayThatTheyCannotSeeUnits) {
  units = std::nullopt;
  EXPECT_THAT(find(checkUnits), IsEmpty());
  EXPECT_THAT(unseen, ElementsAre("units: systemctl gives no answer"));
}

TEST_F(DaemonChecksTest, FindABridgeThatIsInstalledAndDoesNotRun) {
  bridgeUnit = "Id=tw-pipewire.service\nLoadState=loaded\nActiveState=inactive\n";
  EXPECT_THAT(find(checkBridge), ElementsAre(StartsWith("no-bridge: ")));
  EXPECT_THAT(remedies, ElementsAre("systemctl --user enable --now tw-pipewire"));
  bridges = {{42, checkup.around.user}};
  environment["PIPEWIRE_REMOTE"] = directory.path("runtime");
  EXPECT_THAT(find(checkBridge), IsEmpty());
}

// root has no XDG_RUNTIME_DIR in many shells: /pipewire-0 was then missing.
TEST_F(DaemonChecksTest, SayThatTheyDoNotKnowWherePipeWireIs) {
  bridges = {{42, checkup.around.user}};
  environment.erase("XDG_RUNTIME_DIR");
  EXPECT_THAT(find(checkBridge), IsEmpty());
  EXPECT_THAT(unseen, ElementsAre("PipeWire: XDG_RUNTIME_DIR is not set, so its socket is not known"));
  environment["PIPEWIRE_RUNTIME_DIR"] = directory.path("runtime");
  EXPECT_THAT(find(checkBridge), ElementsAre(StartsWith("no-pipewire: ")));
}

TEST_F(DaemonChecksTest, FindABridgeWithoutPipeWire) {
  bridges = {{42, checkup.around.user}};
  environment["XDG_RUNTIME_DIR"] = directory.path("runtime");
  EXPECT_THAT(find(checkBridge), ElementsAre("no-pipewire: tw-pipewire runs, but there is no " +
                                             directory.path("runtime/pipewire-0")));
}

}  // namespace
}  // namespace tonewerk
