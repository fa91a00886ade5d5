// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/ioctl.h>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// A terminal whose size a test chooses. Nobody reads what is written to it.
class TestTerminal {
 public:
  TestTerminal(unsigned short columns, unsigned short rows)
      : master_(::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC)) {
    std::array<char, 64> name{};
    EXPECT_EQ(::grantpt(master_.get()), 0);
    EXPECT_EQ(::unlockpt(master_.get()), 0);
    EXPECT_EQ(::ptsname_r(master_.get(), name.data(), name.size()), 0);
    slave_ = FileDescriptor(::open(name.data(), O_RDWR | O_NOCTTY | O_CLOEXEC));
    winsize size{};
    size.ws_col = columns;
    size.ws_row = rows;
    EXPECT_EQ(::ioctl(master_.get(), TIOCSWINSZ, &size), 0);
  }

  int descriptor() const { return slave_.get(); }

 private:
  const FileDescriptor master_;
  FileDescriptor slave_;
};

}  // namespace tonewerk
