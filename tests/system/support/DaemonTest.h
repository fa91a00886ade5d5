// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gmock/gmock.h>
#include <string>

#include "system/support/DaemonClient.h"
#include "system/support/DaemonProcess.h"

namespace tonewerk {

// A test of one daemon.
//
// At the test's end a daemon that still runs has to end in order, and no run of it may have had anything that
// a sanitizer reports. A test that ends the daemon itself looks at its status itself.
class DaemonTest : public ::testing::Test {
 protected:
  void TearDown() override;

  // A client that is connected, or a test failure.
  DaemonClient connect() { return DaemonClient(daemon.socketPath()); }

  // How many lines the daemon has written that hold both texts.
  std::size_t logLinesWith(const std::string& text, const std::string& other = {}) const;
  bool waitForLogLine(const std::string& text) const;

  DaemonProcess daemon;
};

// The same with the daemon running from the start.
class RunningDaemonTest : public DaemonTest {
 protected:
  void SetUp() override { ASSERT_TRUE(daemon.start()); }
};

// Fails the test when a program built with a sanitizer said in `log` that something is wrong.
void expectNoSanitizerReport(const std::string& log);

}  // namespace tonewerk
