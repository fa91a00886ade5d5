// SPDX-License-Identifier: Apache-2.0
#include <filesystem>

#include "tools/twctl/health/CheckupTest.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

class DirectoryChecksTest : public CheckupTest {};

TEST_F(DirectoryChecksTest, FindNothingInTheDaemonsOwnDirectories) {
  write("state/reports.db", "");
  EXPECT_THAT(find(checkDirectories), IsEmpty());
  EXPECT_THAT(unseen, IsEmpty());
}

TEST_F(DirectoryChecksTest, FindADirectoryThatIsMissingWhileTheDaemonRuns) {
  std::filesystem::remove_all(directory.path("runtime"));
  std::filesystem::remove_all(directory.path("logs"));
  EXPECT_THAT(find(checkDirectories),
              ElementsAre("missing-directory: " + directory.path("runtime") + " is missing"));
  checkup.daemon = {};
  EXPECT_THAT(find(checkDirectories), IsEmpty()) << "the daemon makes it at its start";
}

TEST_F(DirectoryChecksTest, FindWhatBelongsToAnotherUser) {
  checkup.daemon.daemon.set("user", 3'999'999);
  const std::vector<std::string> found = find(checkDirectories);
  ASSERT_THAT(found,
              testing::Contains(StartsWith("foreign-owner: " + directory.path("state") + " belongs to ")));
  EXPECT_EQ(remedies[0], "sudo chown 3999999: " + directory.path("runtime"));
}

TEST_F(DirectoryChecksTest, TakeTheOwnerOfTheSocketForADaemonThatCannotBeAsked) {
  checkup.daemon = {};
  checkup.around.user = 3'999'999;
  write("runtime/reporting.sock", "");
  EXPECT_THAT(find(checkDirectories), IsEmpty()) << "all of it is of one user";
  std::filesystem::remove(directory.path("runtime/reporting.sock"));
  EXPECT_THAT(find(checkDirectories), testing::Contains(StartsWith("foreign-owner: "))) << "the caller's";
}

TEST_F(DirectoryChecksTest, FindWhatEveryUserMayWrite) {
  allow("state", 0757);
  EXPECT_THAT(find(checkDirectories),
              ElementsAre("open-directory: " + directory.path("state") + " can be written by every user"));
  EXPECT_THAT(remedies, ElementsAre("chmod o-w " + directory.path("state")));
}

TEST_F(DirectoryChecksTest, FindWhatItsOwnerMayNotWrite) {
  allow("logs", 0500);
  EXPECT_THAT(find(checkDirectories), ElementsAre(StartsWith("closed-directory: " + directory.path("logs"))));
}

TEST_F(DirectoryChecksTest, RemediesQuotePathsForTheShell) {
  checkup.directories.state = directory.path("my state");
  std::filesystem::create_directory(checkup.directories.state);
  allow("my state", 0757);
  (void)find(checkDirectories);
  EXPECT_THAT(remedies, testing::Contains("chmod o-w '" + directory.path("my state") + "'"));
}

}  // namespace
}  // namespace tonewerk
