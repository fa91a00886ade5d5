// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <list>
#include <memory>
#include <string>
#include <vector>

#include "client/MessageRing.h"
#include "client/ReplyTable.h"
#include "client/SessionState.h"
#include "tonewerk/reporting.h"
#include "values/Mutex.h"

namespace tonewerk {

// Lets a caller wait for the thread. The engine's mutex guards it. It is shared, because in a forked child
// the copy of a condition that a thread of the parent waits for must never be destroyed.
struct Waiter {
  Condition condition;
  bool isDone = false;
  twr_status status = TWR_OK;

  void finish(twr_status result) {
    isDone = true;
    status = result;
    condition.notifyAll();
  }
};

// How far a ring was written when a command was queued. The messages up to there are sent before the command.
struct RingMark {
  std::shared_ptr<twr_sender> sender;
  std::uint64_t position = 0;
  bool isClosed = false;  // the sender was closed by then
};

// A piece of work that waits to be sent.
struct Command {
  enum class Kind {
    kMessage,    // `message`, the bytes of its payload in `body`
    kLoss,       // the losses of `session` that no message has reported, if there are any
    kRequest,    // `body`
    kChange,     // `change` of `session`
    kReconcile,  // the changes that lead `session` to `wanted`
    kBarrier,    // sends nothing; finishes `waiter` when all before it was sent
  };

  Kind kind = Kind::kMessage;
  std::shared_ptr<twr_session> session;  // null for commands of the client itself
  RingMessage message{};
  std::vector<std::int64_t> reporterIDs;  // for a message without a session
  std::string body;
  PendingReply reply;
  std::vector<RingMark> marks;
  std::unique_ptr<SessionChange> change;
  std::unique_ptr<SessionState> wanted;
  std::shared_ptr<Waiter> waiter;
  std::size_t bytes = 0;  // how many it counts in the queue's bound

  std::uint64_t lostBefore = 0;  // the session's losses when the command was queued
  std::uint64_t lostAfter = 0;   // messages that a ring had taken and that would have come next
};

// The memory that a command takes in the queue's list, without what it points to.
inline constexpr std::size_t kCommandBytes = sizeof(Command) + 2 * sizeof(void*);

// Holds the commands that wait to be sent, in order, up to a number of bytes. Commands that are being sent
// count until they were sent. The engine's mutex guards the queue.
class CommandQueue {
 public:
  using Iterator = std::list<Command>::iterator;

  // Room beyond the bound for requests that change a session, so that messages do not displace them.
  static constexpr std::size_t kReserveBytes = std::size_t{64} * 1024;

  explicit CommandQueue(std::size_t maxBytes) : maxBytes_(maxBytes) {}

  // A command that is larger than the bound finds room in an empty queue.
  bool hasRoomForMessage(std::size_t bytes) const;
  bool hasRoomForChange(std::size_t bytes) const;

  // Counts command.bytes. The reference is valid until the command is taken out.
  Command& add(Command command);
  // Inserts before `place` without checking the bound.
  Command& insert(Iterator place, Command command);
  // Puts a command back to the front. Its bytes still count, so none are added.
  void putBack(Command command);
  // Takes out the first command. Its bytes count until released().
  [[nodiscard]] Command take();
  void released(std::size_t bytes) { bytes_ -= bytes; }
  // Removes a command of this queue and its bytes.
  void remove(const Command& command);
  // Removes the barrier of `waiter`, if it is still here.
  void removeBarrier(const Waiter& waiter);
  [[nodiscard]] std::list<Command> takeAll();

  Iterator begin() { return commands_.begin(); }
  Iterator end() { return commands_.end(); }
  Command& front() { return commands_.front(); }
  bool empty() const { return commands_.empty(); }
  std::size_t bytes() const { return bytes_; }

 private:
  void removeAt(Iterator place);

  std::size_t maxBytes_;
  std::size_t bytes_ = 0;
  std::list<Command> commands_;
};

}  // namespace tonewerk
