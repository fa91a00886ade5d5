// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <fstream>
#include <gtest/gtest.h>
#include <signal.h>
#include <string>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include "support/TemporaryDirectory.h"

namespace tonewerk {

// Runs a real dbus-daemon for the test. The constructor starts it.
class PrivateBus {
 public:
  // `elements` are added to its configuration.
  explicit PrivateBus(const std::string& elements = {}) {
    std::ofstream(directory_.path("bus.conf"))
        << "<busconfig><type>session</type><listen>unix:path=" << directory_.path("bus")
        << "</listen><auth>EXTERNAL</auth><policy context=\"default\"><allow send_destination=\"*\"/>"
           "<allow eavesdrop=\"true\"/><allow own=\"*\"/></policy>"
           // The same limits as on session buses.
           "<limit name=\"max_replies_per_connection\">50000</limit>"
           "<limit name=\"max_connections_per_user\">100000</limit>"
        << elements << "</busconfig>";
    start();
  }
  PrivateBus(const PrivateBus&) = delete;
  PrivateBus& operator=(const PrivateBus&) = delete;
  ~PrivateBus() { stop(); }

  bool isRunning() const { return isRunning_; }
  std::string address() const { return "unix:path=" + directory_.path("bus"); }

  // After stop(), at the same address.
  void start() {
    std::array<int, 2> ready{};
    EXPECT_EQ(pipe(ready.data()), 0);
    const std::string configuration = "--config-file=" + directory_.path("bus.conf");
    const std::string report = "--print-address=" + std::to_string(ready[1]);
    process_ = fork();
    if (process_ == 0) become(configuration.c_str(), report.c_str());
    close(ready[1]);
    char byte = 0;
    isRunning_ = read(ready[0], &byte, 1) == 1;
    close(ready[0]);
  }
  void stop() {
    if (process_ <= 0) return;
    kill(process_, SIGKILL);
    waitpid(process_, nullptr, 0);
    process_ = -1;
    isRunning_ = false;
    unlink(directory_.path("bus").c_str());
  }
  // Suspends the daemon until stop().
  void freeze() const { kill(process_, SIGSTOP); }

 private:
  // Runs in the child between fork and exec, where only async-signal-safe calls are allowed.
  [[noreturn]] static void become(const char* configuration, const char* report) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    execlp("dbus-daemon", "dbus-daemon", "--nofork", configuration, report, nullptr);
    _exit(127);
  }

  TemporaryDirectory directory_;
  pid_t process_ = -1;
  bool isRunning_ = false;
};

}  // namespace tonewerk
