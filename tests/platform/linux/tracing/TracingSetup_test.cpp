// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/TracingSetup.h"

#include <cstdlib>
#include <filesystem>
#include <gtest/gtest.h>

#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

TEST(TracingSetupTest, TheMarkIsThereWhileSignpostsCanBeTraced) {
  const TemporaryDirectory runtime;
  EXPECT_FALSE(setSignpostMark(runtime.path(), true));
  EXPECT_FALSE(setSignpostMark(runtime.path(), true));
  EXPECT_TRUE(std::filesystem::exists(runtime.path("signposts")));
  EXPECT_FALSE(setSignpostMark(runtime.path(), false));
  EXPECT_FALSE(std::filesystem::exists(runtime.path("signposts")));
  EXPECT_FALSE(setSignpostMark(runtime.path(), false));
}

TEST(TracingSetupTest, AMarkThatCannotBeMadeIsAnError) {
  EXPECT_EQ(setSignpostMark("/nowhere", true), std::errc::no_such_file_or_directory);
}

TEST(TracingSetupTest, TheLibraryIsTheUsualOneUnlessTheVariableHoldsAPath) {
  ::unsetenv("TONEWERK_SIGNPOSTS");
  EXPECT_EQ(signpostLibraryName(), "libtonewerk-signpost.so.0");
  ::setenv("TONEWERK_SIGNPOSTS", "1", 1);
  EXPECT_EQ(signpostLibraryName(), "libtonewerk-signpost.so.0");
  ::setenv("TONEWERK_SIGNPOSTS", "/opt/lib/x.so", 1);
  EXPECT_EQ(signpostLibraryName(), "/opt/lib/x.so");
  ::unsetenv("TONEWERK_SIGNPOSTS");
}

TEST(TracingSetupTest, TheTracesDirectoryIsAbsolute) {
  EXPECT_EQ(tracesDirectory("/var/lib/tonewerk"), "/var/lib/tonewerk/traces");
  EXPECT_EQ(tracesDirectory("state"), std::filesystem::current_path() / "state/traces");
}

TEST(TracingSetupTest, TheReaderLiesBesideTheProgram) {
  const std::filesystem::path reader = traceReaderPath();
  EXPECT_EQ(reader.filename(), "tw-trace-reader");
  EXPECT_EQ(reader.parent_path(), std::filesystem::read_symlink("/proc/self/exe").parent_path());
}

}  // namespace
}  // namespace tonewerk
