// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <system_error>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "values/Mutex.h"

namespace tonewerk {

// Tells the listener's thread which connections need attention: one has a reply to send, another has room for
// requests again. One signal is enough for all that ask while the listener's thread is busy.
class IoWaker {
 public:
  IoWaker();

  // Why the system has given no descriptor. Then nobody is woken.
  std::error_code problem() const { return {error_, std::generic_category()}; }

  // Any thread.
  void wake(std::uint64_t connection);

  // The listener's thread. Becomes readable when a connection asks. Watch it edge-triggered; it need not be
  // read then, because every signal is a new edge.
  int fileDescriptor() const { return event_.get(); }
  // The listener's thread. The connections that asked since the last call.
  [[nodiscard]] std::vector<std::uint64_t> take();

 private:
  FileDescriptor event_;
  int error_;
  Mutex mutex_;
  std::vector<std::uint64_t> waiting_ GUARDED_BY(mutex_);
};

}  // namespace tonewerk
