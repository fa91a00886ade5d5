// SPDX-License-Identifier: Apache-2.0
// Tests that other programs' builds find the libraries.
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <string>

#include "client/CommandOutput.h"
#include "client/ScriptedServer.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

constexpr char kProgram[] = R"(
#include <stdio.h>
#include <tonewerk/reporting.h>

int main(int count, char** arguments) {
  twr_client_options options = {sizeof(twr_client_options), arguments[count - 1], 0, 0, NULL, NULL};
  twr_client* client = twr_client_create(&options);
  if (twr_session_create(client, 77) == NULL) return 1;
  if (twr_client_flush(client, 30000) != TWR_OK) return 2;
  twr_client_destroy(client, 0);
  puts(twr_version());
  return 0;
}
)";

constexpr char kProject[] = R"(
cmake_minimum_required(VERSION 3.25)
project(program C)
find_package(twreporting 0.1 REQUIRED)
add_executable(shared program.c)
target_link_libraries(shared PRIVATE twreporting::twreporting)
add_executable(static program.c)
target_link_libraries(static PRIVATE twreporting::static)
)";

class InstalledLibraryTest : public testing::Test {
 protected:
  InstalledLibraryTest() {
    std::ofstream(directory.path("program.c")) << kProgram;
    std::ofstream(directory.path("CMakeLists.txt")) << kProject;
    install(prefix);
  }

  static void install(const std::string& where) {
    for (const std::string component : {"library", "development"})
      outputOfCommand(TONEWERK_CMAKE " --install " TONEWERK_BUILD_DIRECTORY " --prefix " + where +
                      " --component " + component);
  }
  static std::string sanitize() {
    const std::string sanitizers = TONEWERK_SANITIZE;
    return sanitizers.empty() ? "" : " -fsanitize=" + sanitizers + " " TONEWERK_SANITIZE_C;
  }
  static std::string libraryDirectory(const std::string& where) {
    for (const auto& entry : std::filesystem::recursive_directory_iterator(where))
      if (entry.path().filename() == "libtwreporting.a") return entry.path().parent_path();
    ADD_FAILURE() << "nothing is installed";
    return {};
  }
  static std::string flags(const std::string& where, const std::string& options) {
    return "$(PKG_CONFIG_PATH=" + where + "/pkgconfig pkg-config " + options + " twreporting)";
  }
  // Builds with the packages of a directory.
  void compile(const std::string& where, const std::string& options, const std::string& program) {
    outputOfCommand(TONEWERK_C_COMPILER " -std=c11 -Wall -Wextra -Wpedantic -Werror" + sanitize() + " " +
                    directory.path("program.c") + " -o " + directory.path(program) + " " +
                    flags(where, options));
  }
  // The program sends reports to a daemon and prints the version.
  void expectReports(const std::string& program, const std::string& environment = "") {
    ScriptedServer daemon(directory.path("reporting.sock"));
    EXPECT_THAT(outputOfCommand(environment + " " + program + " " + directory.path("reporting.sock")),
                testing::MatchesRegex("[0-9]+\\.[0-9]+\\.[0-9]+\n"));
    EXPECT_EQ(daemon.accept()->nextText(), "createReportingSession 77");
  }
  static std::string neededBy(const std::string& program) { return outputOfCommand("readelf -d " + program); }

  TemporaryDirectory directory;
  const std::string prefix = directory.path("prefix");
};

TEST_F(InstalledLibraryTest, IsFoundByPkgConfig) {
  compile(libraryDirectory(prefix), "--cflags --libs", "shared");
  EXPECT_THAT(neededBy(directory.path("shared")), testing::HasSubstr("libtwreporting.so.0"));
  expectReports(directory.path("shared"), "LD_LIBRARY_PATH=" + libraryDirectory(prefix));
}

TEST_F(InstalledLibraryTest, IsFoundByPkgConfigAsAStaticLibrary) {
  // If there is no shared library, the linker takes the static one.
  for (const auto& entry : std::filesystem::directory_iterator(libraryDirectory(prefix)))
    if (entry.path().string().find("libtwreporting.so") != std::string::npos)
      std::filesystem::remove(entry.path());
  compile(libraryDirectory(prefix), "--static --cflags --libs", "static");
  EXPECT_THAT(neededBy(directory.path("static")), testing::Not(testing::HasSubstr("libtwreporting")));
  expectReports(directory.path("static"));
}

TEST_F(InstalledLibraryTest, IsFoundByPkgConfigBeforeItIsInstalled) {
  compile(TONEWERK_BUILD_DIRECTORY, "--cflags --libs", "shared");
  EXPECT_THAT(neededBy(directory.path("shared")), testing::HasSubstr("libtwreporting.so.0"));
  // Without a variable, because the program contains the path at which the library was built.
  expectReports(directory.path("shared"), "LD_LIBRARY_PATH=");
}

TEST_F(InstalledLibraryTest, IsFoundByCMake) {
  const std::string build = directory.path("build");
  outputOfCommand(TONEWERK_CMAKE " -S " + directory.path() + " -B " + build +
                  " -DCMAKE_C_COMPILER=" TONEWERK_C_COMPILER " -DCMAKE_PREFIX_PATH=" + prefix +
                  " '-DCMAKE_C_FLAGS=" + sanitize() + "'");
  outputOfCommand(TONEWERK_CMAKE " --build " + build);
  EXPECT_THAT(neededBy(build + "/shared"), testing::HasSubstr("libtwreporting.so.0"));
  EXPECT_THAT(neededBy(build + "/static"), testing::Not(testing::HasSubstr("libtwreporting")));
  expectReports(build + "/shared");
  expectReports(build + "/static");
}

}  // namespace
}  // namespace tonewerk
