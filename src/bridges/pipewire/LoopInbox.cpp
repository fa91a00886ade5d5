// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/LoopInbox.h"

#include <utility>

namespace tonewerk {

LoopInbox::LoopInbox(EventLoop& loop)
    : source_(event_.open() ? loop.watch(event_.fileDescriptor(), [this] { runAll(); }) : nullptr) {}

void LoopInbox::post(std::function<void()> work) {
  const MutexLock lock(mutex_);
  posted_.push_back(std::move(work));
  event_.signal();
}

void LoopInbox::runAll() {
  std::vector<std::function<void()>> posted;
  {
    const MutexLock lock(mutex_);
    event_.clear();
    posted.swap(posted_);
  }
  for (const std::function<void()>& work : posted) work();
}

}  // namespace tonewerk
