// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Waits for the events of a command that runs until it is stopped.
//
// While an object exists, the first SIGINT, SIGTERM, SIGHUP or SIGQUIT is an event; a second one of the same
// kind ends the process at once. There may be one object at a time, used on one thread.
class LiveEvents {
 public:
  using Time = std::chrono::steady_clock::time_point;

  enum class Event {
    kTime,      // the time has come
    kReadable,  // the descriptor is readable
    kKey,       // a key was pressed; key() returns it, unless the caller reads keys
    kResized,   // the terminal has another size
    kStopped,   // by a signal, or because the reader of the output has closed it
  };

  // Who reads the keys. With kLeft, kKey means that there is something to read.
  enum class Keys { kRead, kLeft };

  // Reads keys from `in`, and watches `out` for the end of its reader. -1 for none.
  LiveEvents(int in, int out, Keys keys = Keys::kRead);
  LiveEvents(const LiveEvents&) = delete;
  LiveEvents& operator=(const LiveEvents&) = delete;
  // Restores the previous signal handlers.
  ~LiveEvents();

  // Waits until `readable` (-1 for none) is readable, the time has come, or another event. After kStopped it
  // always returns kStopped.
  [[nodiscard]] Event wait(int readable, std::optional<Time> until);

  // The last key for which wait() has returned kKey.
  char key() const { return key_; }

 private:
  [[nodiscard]] std::optional<Event> takeSignal();
  [[nodiscard]] bool takeKey();

  int in_;
  const int out_;
  const Keys keys_;
  FileDescriptor signals_;  // receives a byte for each signal
  bool isStopped_ = false;
  char key_ = 0;
};

}  // namespace tonewerk
