// SPDX-License-Identifier: Apache-2.0
#include "system/support/DaemonTest.h"

#include <sstream>

namespace tonewerk {

void DaemonTest::TearDown() {
  if (daemon.process().isRunning()) {
    EXPECT_EQ(daemon.stop(), 0) << daemon.log();
  }
  expectNoSanitizerReport(daemon.log());
}

std::size_t DaemonTest::logLinesWith(const std::string& text, const std::string& other) const {
  std::istringstream lines(daemon.log());
  std::size_t count = 0;
  for (std::string line; std::getline(lines, line);) {
    if (line.find(text) != std::string::npos && line.find(other) != std::string::npos) ++count;
  }
  return count;
}

bool DaemonTest::waitForLogLine(const std::string& text) const {
  return waitUntil([&] { return logLinesWith(text) > 0; });
}

void expectNoSanitizerReport(const std::string& log) {
  for (const char* mark : {"Sanitizer", "runtime error:"}) {
    EXPECT_THAT(log, ::testing::Not(::testing::HasSubstr(mark)));
  }
}

}  // namespace tonewerk
