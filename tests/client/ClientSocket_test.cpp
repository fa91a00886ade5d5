// SPDX-License-Identifier: Apache-2.0
#include "client/ClientSocket.h"

#include <cstdlib>
#include <gmock/gmock.h>

namespace tonewerk {
namespace {

using testing::ElementsAre;

class DefaultSocketPathsTest : public testing::Test {
 protected:
  DefaultSocketPathsTest() {
    for (const char* name : {"TONEWERK_REPORTING_SOCKET", "RUNTIME_DIRECTORY", "XDG_RUNTIME_DIR"})
      ::unsetenv(name);
  }
};

TEST_F(DefaultSocketPathsTest, TriesTheChosenSocketAndNothingElse) {
  ::setenv("TONEWERK_REPORTING_SOCKET", "/a/socket", 1);
  ::setenv("XDG_RUNTIME_DIR", "/b", 1);
  EXPECT_THAT(defaultSocketPaths(), ElementsAre("/a/socket"));
}

TEST_F(DefaultSocketPathsTest, TriesItsOwnDirectoryAndThenTheSystems) {
  ::setenv("TONEWERK_REPORTING_SOCKET", "", 1);
  ::setenv("XDG_RUNTIME_DIR", "/b", 1);
  EXPECT_THAT(defaultSocketPaths(),
              ElementsAre("/b/tonewerk/reporting.sock", "/run/tonewerk/reporting.sock"));
  ::setenv("RUNTIME_DIRECTORY", "/c", 1);
  EXPECT_THAT(defaultSocketPaths(), ElementsAre("/c/reporting.sock", "/run/tonewerk/reporting.sock"));
}

TEST_F(DefaultSocketPathsTest, TriesTheSystemsOnceWhereTheTwoAreOne) {
  ::setenv("RUNTIME_DIRECTORY", "/run/tonewerk", 1);
  EXPECT_THAT(defaultSocketPaths(), ElementsAre("/run/tonewerk/reporting.sock"));
}

}  // namespace
}  // namespace tonewerk
