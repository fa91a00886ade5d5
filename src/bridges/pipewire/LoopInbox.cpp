// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/LoopInbox.h"

#include <cstdint>
#include <sys/eventfd.h>
#include <unistd.h>
#include <utility>

namespace tonewerk {

LoopInbox::LoopInbox(EventLoop& loop)
    : event_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)),
      source_(event_ ? loop.watch(event_.get(), [this] { runAll(); }) : nullptr) {}

void LoopInbox::post(std::function<void()> work) {
  const std::lock_guard lock(mutex_);
  posted_.push_back(std::move(work));
  const std::uint64_t one = 1;
  // Fails only where the counter is full, and then it is readable.
  static_cast<void>(::write(event_.get(), &one, sizeof(one)) < 0);
}

void LoopInbox::runAll() {
  std::vector<std::function<void()>> posted;
  {
    const std::lock_guard lock(mutex_);
    std::uint64_t count = 0;
    static_cast<void>(::read(event_.get(), &count, sizeof(count)) < 0);
    posted.swap(posted_);
  }
  for (const std::function<void()>& work : posted) work();
}

}  // namespace tonewerk
