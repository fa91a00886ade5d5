// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "values/Mutex.h"

namespace tonewerk {

// Tells the I/O thread which connections want to be looked at: one has a reply to send, another room for
// requests. However many ask while the I/O thread is busy, one signal to it is enough.
class IoWaker {
 public:
  IoWaker();

  // Any thread.
  void wake(std::uint64_t connection);

  // The I/O thread: readable, edge-triggered, when somebody asked. It needs no reading, because every signal
  // is an edge of its own.
  int fileDescriptor() const { return event_.get(); }
  // The I/O thread: who asked since the last call.
  [[nodiscard]] std::vector<std::uint64_t> take();

 private:
  FileDescriptor event_;
  Mutex mutex_;
  std::vector<std::uint64_t> waiting_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
