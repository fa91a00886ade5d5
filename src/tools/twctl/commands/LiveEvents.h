// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <optional>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// What a command that runs until it is stopped waits for.
//
// While there is one, the first SIGINT, SIGTERM, SIGHUP or SIGQUIT is an event; a second one ends the process
// at once, whatever it waits for. One at a time, on one thread.
class LiveEvents {
 public:
  using Time = std::chrono::steady_clock::time_point;

  enum class Event {
    kTime,      // nothing else happened by then
    kReadable,  // the descriptor asked for
    kKey,       // key() has it
    kResized,   // the terminal
    kStopped,   // by a signal, or nobody reads the output any more
  };

  // Keys come from `in`, and `out` is watched for its reader's end; -1 for neither.
  LiveEvents(int in, int out);
  LiveEvents(const LiveEvents&) = delete;
  LiveEvents& operator=(const LiveEvents&) = delete;
  // Signals do again what they did before.
  ~LiveEvents();

  // Waits for what comes first: `readable` (-1 for none) to be so, or the time. Once stopped, always stopped.
  [[nodiscard]] Event wait(int readable, std::optional<Time> until);

  // The last key that wait() told of.
  char key() const { return key_; }

 private:
  [[nodiscard]] std::optional<Event> takeSignal();
  [[nodiscard]] bool takeKey();

  int in_;
  const int out_;
  FileDescriptor signals_;  // a byte for each that came
  bool isStopped_ = false;
  char key_ = 0;
};

}  // namespace tonewerk
