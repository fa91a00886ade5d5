// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/directories/Directories.h"

#include <gtest/gtest.h>
#include <map>

namespace tonewerk {
namespace {

constexpr uid_t kRoot = 0;
constexpr uid_t kUser = 1000;

Directories directoriesOf(const std::map<std::string, std::string>& variables, uid_t user) {
  const auto environment = [&](const std::string& name) -> std::optional<std::string> {
    const auto found = variables.find(name);
    return found == variables.end() ? std::nullopt : std::optional(found->second);
  };
  return Directories::from(environment, user);
}

TEST(DirectoriesTest, AServiceManagersVariablesComeFirst) {
  const std::map<std::string, std::string> variables = {{"RUNTIME_DIRECTORY", "/r"},
                                                        {"STATE_DIRECTORY", "/s"},
                                                        {"LOGS_DIRECTORY", "/l"},
                                                        {"CONFIGURATION_DIRECTORY", "/c"},
                                                        {"XDG_STATE_HOME", "/other"}};
  const Directories expected{"/r", "/s", "/l", "/c"};
  EXPECT_EQ(directoriesOf(variables, kUser), expected);
  EXPECT_EQ(directoriesOf(variables, kRoot), expected);
}

TEST(DirectoriesTest, OfSeveralServiceDirectoriesTheFirstIsTaken) {
  EXPECT_EQ(directoriesOf({{"STATE_DIRECTORY", "/var/lib/a/:/var/lib/b"}}, kUser).state, "/var/lib/a");
}

TEST(DirectoriesTest, AUsersBaseDirectoriesComeNext) {
  const std::map<std::string, std::string> variables = {
      {"XDG_RUNTIME_DIR", "/x/run"}, {"XDG_STATE_HOME", "/x/state"}, {"XDG_CONFIG_HOME", "/x/config"}};
  const Directories expected{"/x/run/tonewerk", "/x/state/tonewerk", "/x/state/tonewerk/logs",
                             "/x/config/tonewerk"};
  EXPECT_EQ(directoriesOf(variables, kUser), expected);
  EXPECT_EQ(directoriesOf(variables, kRoot), expected);
}

TEST(DirectoriesTest, AUserWithoutVariablesUsesDirectoriesBelowHome) {
  const Directories expected{"/run/user/1000/tonewerk", "/home/u/.local/state/tonewerk",
                             "/home/u/.local/state/tonewerk/logs", "/home/u/.config/tonewerk"};
  EXPECT_EQ(directoriesOf({{"HOME", "/home/u"}}, kUser), expected);
}

TEST(DirectoriesTest, RootWithoutVariablesUsesTheSystemsDirectories) {
  EXPECT_EQ(directoriesOf({{"HOME", "/root"}}, kRoot), Directories::system());
  EXPECT_EQ(Directories::system().logs, "/var/log/tonewerk");
}

TEST(DirectoriesTest, LogsFollowAStateDirectoryThatRootChose) {
  EXPECT_EQ(directoriesOf({{"STATE_DIRECTORY", "/tmp/demo"}}, kRoot).logs, "/tmp/demo/logs");
}

TEST(DirectoriesTest, EmptyAndRelativeBaseDirectoriesCountAsNotSet) {
  const Directories chosen =
      directoriesOf({{"HOME", "/h"}, {"XDG_STATE_HOME", ""}, {"XDG_CONFIG_HOME", "relative"}}, kUser);
  EXPECT_EQ(chosen.state, "/h/.local/state/tonewerk");
  EXPECT_EQ(chosen.configuration, "/h/.config/tonewerk");
}

}  // namespace
}  // namespace tonewerk
