// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <memory>
#include <vector>

#include "bridges/pipewire/EventLoop.h"
#include "platform/linux/descriptors/WakeEvent.h"
#include "values/Mutex.h"

namespace tonewerk {

// Runs work of other threads on the loop's thread, in the order in which it was posted.
class LoopInbox {
 public:
  // `loop` outlives this object.
  explicit LoopInbox(EventLoop& loop);
  LoopInbox(const LoopInbox&) = delete;
  LoopInbox& operator=(const LoopInbox&) = delete;
  // Work that has not run yet is dropped.
  ~LoopInbox() = default;

  // False when the system had no descriptor for it: posted work then never runs.
  [[nodiscard]] bool isOpen() const { return source_ != nullptr; }

  // Any thread.
  void post(std::function<void()> work);

 private:
  void runAll();

  WakeEvent event_;
  Mutex mutex_;
  std::vector<std::function<void()>> posted_ GUARDED_BY(mutex_);
  std::unique_ptr<EventLoop::Source> source_;  // last, because its callback uses the others
};

}  // namespace tonewerk
