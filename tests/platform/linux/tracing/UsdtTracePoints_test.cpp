// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/UsdtTracePoints.h"

#include <array>
#include <cstdio>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <unistd.h>

namespace tonewerk {
namespace {

using testing::ContainsRegex;
using testing::HasSubstr;

std::string outputOf(const char* command) {
  const std::unique_ptr<FILE, int (*)(FILE*)> pipe(popen(command, "r"), pclose);
  std::string text;
  std::array<char, 4096> buffer{};
  while (pipe != nullptr && fgets(buffer.data(), static_cast<int>(buffer.size()), pipe.get()) != nullptr) {
    text += buffer.data();
  }
  return text;
}

TEST(UsdtTracePointsTest, TheProgramHasAProbeThatTracersFind) {
  UsdtTracePoints().emit(7);  // keeps the linker from removing the probe
  const std::string command = "readelf --notes /proc/" + std::to_string(getpid()) + "/exe";
  const std::string notes = outputOf(command.c_str());
  EXPECT_THAT(notes, HasSubstr("Provider: tonewerk"));
  EXPECT_THAT(notes, ContainsRegex("Name: event"));
  EXPECT_THAT(notes, ContainsRegex("Arguments: 4@"));
}

}  // namespace
}  // namespace tonewerk
