// SPDX-License-Identifier: Apache-2.0
//
// Tests `twctl status` and `twctl doctor` as programs, with a running daemon.
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <optional>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "support/TemporaryDirectory.h"
#include "system/support/DaemonTest.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using ::testing::AnyOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

constexpr int kWell = 0;
constexpr int kWrong = 1;
constexpr int kNoDaemon = 3;

class StatusTest : public DaemonTest {
 protected:
  // Runs the tool to its end and returns its exit status. Fills `output` and `errors`.
  std::optional<int> run(const std::vector<std::string>& arguments) {
    const TemporaryDirectory directory;
    ChildProcess process;
    const ChildCommand command{
        TONEWERK_TWCTL_PATH,
        arguments,
        {{"RUNTIME_DIRECTORY", daemon.path(DaemonProcess::kRuntime)},
         {"STATE_DIRECTORY", daemon.path(DaemonProcess::kState)},
         {"LOGS_DIRECTORY", daemon.path(DaemonProcess::kLogs)},
         {"CONFIGURATION_DIRECTORY", daemon.path(DaemonProcess::kConfiguration)},
         {"PATH", directory.path()}}};  // no systemctl, whose answers are the machine's
    if (!process.start(command, directory.path("output"), directory.path("errors"))) return {};
    const std::optional<int> exit = process.wait();
    output = textOfFile(directory.path("output"));
    errors = textOfFile(directory.path("errors"));
    expectNoSanitizerReport(errors);
    return exit;
  }

  // What `twctl doctor` finds, by name, beside what is the machine's.
  std::vector<std::string> findings() {
    status = run({"doctor", "--json"});
    std::vector<std::string> names;
    std::istringstream lines(output);
    for (std::string line; std::getline(lines, line);) {
      const json finding = json::parse(line, nullptr, false);
      if (!finding.contains("finding")) continue;
      const std::string name = finding["finding"];
      EXPECT_FALSE(finding["remedy"].get<std::string>().empty()) << line;
      if (name != "full-disk" && name != "no-pipewire") names.push_back(name);
    }
    return names;
  }

  std::optional<int> status;
  std::string output;
  std::string errors;
};

TEST_F(StatusTest, ADaemonThatWasJustStartedIsWell) {
  ASSERT_TRUE(daemon.start());
  EXPECT_EQ(run({"status", "--json"}), kWell) << output << errors << daemon.log();
  const json object = json::parse(output);
  EXPECT_EQ(object["well"], true);
  EXPECT_EQ(object["daemon"]["processIdentifier"], daemon.process().identifier());
  EXPECT_EQ(object["daemon"]["mode"], "private");
  EXPECT_EQ(object["daemon"]["internalBuild"], false);
  EXPECT_EQ(object["store"]["path"], daemon.storePath());
  EXPECT_THAT(object["sinks"], Not(IsEmpty()));
  EXPECT_EQ(run({}), kWell) << "without a command it is the status";
  EXPECT_THAT(output, HasSubstr("\nwell "));
  EXPECT_THAT(errors, IsEmpty());
}

TEST_F(StatusTest, WithoutADaemonTheStatusIsThree) {
  EXPECT_EQ(run({"status"}), kNoDaemon);
  EXPECT_THAT(output, HasSubstr("daemon    no daemon listens on "));
  EXPECT_THAT(errors, HasSubstr("twctl: no daemon listens on "));
  EXPECT_EQ(run({"--json"}), kNoDaemon);
  EXPECT_EQ(json::parse(output)["daemon"]["answers"], false);
}

TEST_F(StatusTest, AnErrorOfTheDaemonIsShownAndIsWrong) {
  ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBuild = maybe\n"));
  ASSERT_TRUE(daemon.start());
  EXPECT_EQ(run({"status"}), kWrong);
  EXPECT_THAT(output, HasSubstr("device-facts.toml:1:"));
  EXPECT_THAT(output, HasSubstr("wrong     the daemon has logged 1 error in the last hour"));
}

TEST_F(StatusTest, TheDoctorFindsNothingWhereAllIsWell) {
  ASSERT_TRUE(daemon.start());
  EXPECT_THAT(findings(), IsEmpty()) << output;
  EXPECT_THAT(status, AnyOf(kWell, kWrong)) << "a full disk is the machine's";
}

TEST_F(StatusTest, TheDoctorFindsWhatIsWrongWithFiles) {
  const std::string preferences = daemon.path(DaemonProcess::kConfiguration, "preferences");
  std::filesystem::create_directories(preferences);
  ASSERT_TRUE(daemon.writeConfiguration("preferences/com.orvane.tonewerk.store.toml", "max_dais = 5\n"));
  ASSERT_TRUE(daemon.start());
  ASSERT_EQ(chmod(daemon.path(DaemonProcess::kLogs).c_str(), 0777), 0);
  EXPECT_THAT(findings(), ::testing::ElementsAre("open-directory", "unknown-key", "logged-errors"));
  EXPECT_EQ(status, kWrong);
  EXPECT_EQ(run({"doctor"}), kWrong);
  EXPECT_THAT(output, HasSubstr("\nremedy  chmod o-w "));
}

TEST_F(StatusTest, TheDoctorChecksTheRestWithoutADaemon) {
  ASSERT_TRUE(daemon.writeConfiguration("device-facts.toml", "InternalBild = true\n"));
  EXPECT_THAT(findings(), ::testing::ElementsAre("no-daemon", "other-socket", "wrong-fact"));
  EXPECT_EQ(status, kNoDaemon);
}

}  // namespace
}  // namespace tonewerk
