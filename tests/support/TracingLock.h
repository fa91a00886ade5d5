// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <string>
#include <sys/file.h>
#include <unistd.h>

namespace tonewerk {

// Makes the tests of one user that use a real tracer run one after the other, also in different programs:
// each user has one session daemon for the whole machine.
class TracingLock {
 public:
  TracingLock() { EXPECT_EQ(::flock(file_, LOCK_EX), 0); }
  TracingLock(const TracingLock&) = delete;
  TracingLock& operator=(const TracingLock&) = delete;
  ~TracingLock() { ::close(file_); }

 private:
  static int open() {
    const std::string path = "/tmp/tonewerk-tracing-tests-" + std::to_string(::getuid()) + ".lock";
    return ::open(path.c_str(), O_RDONLY | O_CREAT | O_CLOEXEC, 0600);
  }

  const int file_ = open();
};

}  // namespace tonewerk
