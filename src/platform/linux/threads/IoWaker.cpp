// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/threads/IoWaker.h"

#include <cerrno>
#include <sys/eventfd.h>
#include <utility>

namespace tonewerk {

IoWaker::IoWaker() : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)), error_(event_ ? 0 : errno) {}

void IoWaker::wake(std::uint64_t connection) {
  {
    const MutexLock lock(mutex_);
    waiting_.push_back(connection);
    if (waiting_.size() > 1) return;  // the first one has signalled
  }
  // Fails only when the counter is full, after 2^64 signals.
  static_cast<void>(::eventfd_write(event_.get(), 1));
}

std::vector<std::uint64_t> IoWaker::take() {
  const MutexLock lock(mutex_);
  return std::exchange(waiting_, {});
}

}  // namespace tonewerk
