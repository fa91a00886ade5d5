// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cerrno>
#include <cstdint>
#include <sys/eventfd.h>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Wakes a thread that polls fileDescriptor(). Signals before clear() count as one. Any thread, except open()
// and close().
class WakeEvent {
 public:
  // False when the system has no descriptor left.
  [[nodiscard]] bool open() {
    event_.reset(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
    return static_cast<bool>(event_);
  }
  void close() { event_.reset(); }

  int fileDescriptor() const { return event_.get(); }
  void signal() const {
    const std::uint64_t one = 1;
    while (::write(event_.get(), &one, sizeof(one)) < 0 && errno == EINTR) {
    }
  }
  void clear() const {
    std::uint64_t count = 0;
    while (::read(event_.get(), &count, sizeof(count)) < 0 && errno == EINTR) {
    }
  }

 private:
  FileDescriptor event_;
};

}  // namespace tonewerk
