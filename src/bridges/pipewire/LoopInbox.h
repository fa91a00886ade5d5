// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <memory>
#include <vector>

#include "bridges/pipewire/EventLoop.h"
#include "platform/linux/descriptors/WakeEvent.h"
#include "values/Mutex.h"

namespace tonewerk {

// What other threads leave for the loop's thread to run, in the order in which they left it.
class LoopInbox {
 public:
  // `loop` outlives this.
  explicit LoopInbox(EventLoop& loop);
  LoopInbox(const LoopInbox&) = delete;
  LoopInbox& operator=(const LoopInbox&) = delete;
  // What was not run yet never is.
  ~LoopInbox() = default;

  // False when the system had no descriptor for it; nothing is then ever run.
  [[nodiscard]] bool isOpen() const { return source_ != nullptr; }

  // Any thread.
  void post(std::function<void()> work);

 private:
  void runAll();

  WakeEvent event_;
  Mutex mutex_;
  std::vector<std::function<void()>> posted_ GUARDED_BY(mutex_);
  std::unique_ptr<EventLoop::Source> source_;  // last: its callback uses the others
};

}  // namespace tonewerk
