// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gmock/gmock.h>
#include <string>

#include "system/support/DaemonClient.h"
#include "system/support/DaemonProcess.h"

namespace tonewerk {

// Base of tests with one daemon.
//
// At the end of the test, a daemon that still runs must exit in order, and none of its runs may have had a
// sanitizer report. A test that ends the daemon itself checks the status itself.
class DaemonTest : public ::testing::Test {
 protected:
  void TearDown() override;

  // Returns a connected client; failure to connect is a test failure.
  DaemonClient connect() { return DaemonClient(daemon.socketPath()); }

  // The number of log lines that contain both texts.
  std::size_t logLinesWith(const std::string& text, const std::string& other = {}) const;
  bool waitForLogLine(const std::string& text) const;

  DaemonProcess daemon;
};

// The same with the daemon running from the start.
class RunningDaemonTest : public DaemonTest {
 protected:
  void SetUp() override { ASSERT_TRUE(daemon.start()); }
};

// Fails the test when `log` contains a sanitizer report.
void expectNoSanitizerReport(const std::string& log);

}  // namespace tonewerk
