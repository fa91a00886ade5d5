// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <list>

#include "client/Command.h"

namespace tonewerk {

// What waits to be sent, in order, up to a number of bytes. Commands that are being sent count until they
// have gone out. Under the engine's mutex.
class CommandQueue {
 public:
  using Iterator = std::list<Command>::iterator;

  // What there is beyond the bound for requests that change a session, so that messages do not crowd them
  // out.
  static constexpr std::size_t kReserveBytes = std::size_t{64} * 1024;

  explicit CommandQueue(std::size_t mostBytes) : mostBytes_(mostBytes) {}

  // What alone is larger than the bound finds room where there is nothing else.
  bool hasRoomForMessage(std::size_t bytes) const;
  bool hasRoomForChange(std::size_t bytes) const;

  // Counts command.bytes. The reference is valid until the command is taken out.
  Command& add(Command command);
  // Before `place`; the bound is the caller's business.
  Command& insert(Iterator place, Command command);
  // Counts nothing: what comes back has never stopped counting.
  void putBack(Command command);
  // The first. It goes on counting until released().
  Command take();
  void released(std::size_t bytes) { bytes_ -= bytes; }
  // One that is here, and counts no longer.
  void remove(const Command& command);
  // The one that `waiter` waits for, if it is still here.
  void removeBarrier(const Waiter& waiter);
  std::list<Command> takeAll();

  Iterator begin() { return commands_.begin(); }
  Iterator end() { return commands_.end(); }
  Command& front() { return commands_.front(); }
  bool empty() const { return commands_.empty(); }
  std::size_t bytes() const { return bytes_; }

 private:
  void removeAt(Iterator place);

  std::size_t mostBytes_;
  std::size_t bytes_ = 0;
  std::list<Command> commands_;
};

}  // namespace tonewerk
