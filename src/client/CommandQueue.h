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

// A caller that waits, under the engine's mutex. It is shared, because a caller that forks away leaves one
// behind that must never be destroyed: it still has a waiter.
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

// How far a ring had been written when something was asked for: so far it goes out before.
struct RingMark {
  std::shared_ptr<twr_sender> sender;
  std::uint64_t position = 0;
  bool isClosed = false;  // already: nothing more was to come
};

// Something that waits to be sent.
struct Command {
  enum class Kind {
    kMessage,    // `message`, the bytes of its payload in `body`
    kLoss,       // nothing but what `session` has lost and no message has told, if there is something
    kRequest,    // `body`
    kChange,     // `change` of `session`
    kReconcile,  // whatever leads `session` to `wanted`
    kBarrier,    // nothing; tells `waiter` that all before it has gone out
  };

  Kind kind = Kind::kMessage;
  std::shared_ptr<twr_session> session;  // null for the client's own
  RingMessage message{};
  std::vector<std::int64_t> reporterIDs;  // of a message without a session
  std::string body;
  PendingReply reply;
  std::vector<RingMark> marks;
  std::unique_ptr<SessionChange> change;
  std::unique_ptr<SessionState> wanted;
  std::shared_ptr<Waiter> waiter;
  std::size_t bytes = 0;  // what it counts for in the queue's bound

  std::uint64_t lostBefore = 0;  // of the session, when it was asked for
  std::uint64_t lostAfter = 0;   // of messages that were taken, and would have come next
};

// What a command takes in memory next to what it points at: with its place in the queue's list.
inline constexpr std::size_t kCommandBytes = sizeof(Command) + 2 * sizeof(void*);

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
  [[nodiscard]] Command take();
  void released(std::size_t bytes) { bytes_ -= bytes; }
  // One that is here, and counts no longer.
  void remove(const Command& command);
  // The one that `waiter` waits for, if it is still here.
  void removeBarrier(const Waiter& waiter);
  [[nodiscard]] std::list<Command> takeAll();

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
