// SPDX-License-Identifier: Apache-2.0
#include "system/support/PseudoTerminal.h"

#include <array>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include "system/support/ChildProcess.h"

namespace tonewerk {

PseudoTerminal::PseudoTerminal() : master_(::posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC)) {
  std::array<char, 64> name{};
  if (::grantpt(master_.get()) != 0 || ::unlockpt(master_.get()) != 0 ||
      ::ptsname_r(master_.get(), name.data(), name.size()) != 0) {
    ADD_FAILURE() << "there is no pseudo-terminal";
    return;
  }
  path_ = name.data();
  slave_ = FileDescriptor(::open(path_.c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC));
  ::fcntl(master_.get(), F_SETFL, O_NONBLOCK);
  resize(80, 24);
}

void PseudoTerminal::resize(unsigned short columns, unsigned short rows) const {
  winsize size{};
  size.ws_col = columns;
  size.ws_row = rows;
  EXPECT_EQ(::ioctl(master_.get(), TIOCSWINSZ, &size), 0);
}

void PseudoTerminal::press(std::string_view keys) const {
  EXPECT_EQ(::write(master_.get(), keys.data(), keys.size()), static_cast<ssize_t>(keys.size()));
}

bool PseudoTerminal::waitFor(const std::string& text) {
  return waitUntil([&] {
    collect();
    const std::size_t found = written_.find(text, seen_);
    if (found == std::string::npos) return false;
    seen_ = found + text.size();
    return true;
  });
}

const std::string& PseudoTerminal::written() {
  collect();
  return written_;
}

termios PseudoTerminal::modes() const {
  termios modes{};
  EXPECT_EQ(::tcgetattr(slave_.get(), &modes), 0);
  return modes;
}

void PseudoTerminal::collect() {
  std::array<char, 4096> bytes;
  for (ssize_t count = 1; count > 0;) {
    count = ::read(master_.get(), bytes.data(), bytes.size());
    if (count > 0) written_.append(bytes.data(), static_cast<std::size_t>(count));
  }
}

}  // namespace tonewerk
