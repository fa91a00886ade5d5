// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <vector>

#include "platform/SerialQueue.h"
#include "platform/accounts/Account.h"
#include "platform/accounts/WorkingFor.h"
#include "values/Mutex.h"
#include "values/UniqueFunction.h"

namespace tonewerk {

class Clock;
class Timer;
class TimerService;

// Runs the work of all users on one serial queue, and takes turns between the users.
//
//   add() ... add()  ->  a lane for each user  ->  the serial queue runs one turn after the other
//                            |  ^
//      no room for reports   v  |  room again, or kLongestWait is over
//                           waiting
//
// The pieces of one user run in the order in which they were added. Between users the time is shared by
// deficit round robin: each user with work gets kTurn in each round, and a user whose turn took longer pays
// in the next rounds. A piece that may take long asks isTurnOver() and goes on in the user's next turn.
//
// A user whose reports wait for a sink, as many as the user's share allows, gets no turn until they are
// written. So the work queue does not wait for the disk on behalf of one user while others have work.
//
// Any thread, unless a member says otherwise.
class TurnQueue : public std::enable_shared_from_this<TurnQueue> {
 public:
  static constexpr std::chrono::microseconds kTurn{1000};
  // What a user's turn took too long counts up to this time.
  static constexpr std::chrono::milliseconds kLargestDebt{50};
  // A user who has waited for so long goes on without room, until there is some again: the sink may hang.
  static constexpr std::chrono::milliseconds kLongestWait{2000};
  static constexpr std::chrono::milliseconds kLongestFinish{5000};

  // A piece of work is called again, in the user's next turn, as long as it returns kMore.
  enum class Progress { kDone, kMore };
  using Piece = UniqueFunction<Progress()>;

  // `queue`, `clock` and `timers` outlive the object.
  TurnQueue(SerialQueue& queue, const Clock& clock, TimerService& timers);
  TurnQueue(const TurnQueue&) = delete;
  TurnQueue& operator=(const TurnQueue&) = delete;
  ~TurnQueue();

  // Queues a piece. It runs on the serial queue, in a scope of WorkingFor.
  void add(const std::shared_ptr<Account>& account, Piece piece);

  // Runs a piece: to its end at once when the calling thread runs other work of the queue than a turn, as it
  // does while it plays the journal; else adds it.
  void run(const std::shared_ptr<Account>& account, Piece piece);

  // Runs `work` at once, on the calling thread and as the serial queue's own work, when nothing else runs or
  // waits there and the user has no work that must run before. Returns false, without running it, otherwise.
  template <typename Work>
  [[nodiscard]] bool runAtOnce(const std::shared_ptr<Account>& account, Work&& work) {
    bool hasRun = false;
    const bool wasFree = queue_.runAtOnce([&] {
      if (mayHaveWaiting_.load(std::memory_order_relaxed)) return;
      const WorkingFor scope(account);
      running_ = account.get();
      work();
      running_ = nullptr;
      hasRun = true;
    });
    return wasFree && hasRun;
  }

  // In a running piece: queues a piece before all others of the same user, and before the rest of the running
  // one, which should return kMore. False outside of a piece, where it is not queued.
  [[nodiscard]] bool continueFirst(Piece& piece);

  // In a running piece: true when the piece should return kMore soon. False outside of pieces.
  bool isTurnOver() const {
    if (running_ == nullptr) return false;
    return !continuations_.empty() || isOverShare() ||
           (othersWait_.load(std::memory_order_relaxed) && isTimeOver());
  }

  // The same for a piece of long steps, such as the stops of many sessions: also true after a turn's time
  // when nobody waits, so that the serial queue's other work comes in between.
  bool isTurnOverAfterLongStep() const { return running_ != nullptr && (isTurnOver() || isTimeOver()); }

  // From now on no user waits for room. Returns when everything that was added has run. After kLongestFinish,
  // long pieces are asked to give up (mustGiveUp()). Not in the queue's own work.
  void finish();
  // True when the end has waited so long that a piece of very many steps, such as a message to thousands of
  // sessions, should leave out the rest.
  bool mustGiveUp() const { return mustGiveUp_.load(std::memory_order_relaxed); }
  // Drops what is left, and everything that is added later. Call it before the serial queue ends.
  void close();

 private:
  struct Lane {
    std::shared_ptr<Account> account;
    std::deque<Piece> pieces;
    std::chrono::nanoseconds deficit{0};
    std::chrono::nanoseconds idleSince{0};
    enum class State { kIdle, kReady, kRunning, kWaiting } state = State::kIdle;
    std::atomic<bool> hasWaitedLong = false;  // its account's room does not count until there is some
    std::unique_ptr<Timer> timer;
  };

  void runTurn();
  // The lane whose turn it is. Lanes without room go to `waiting`. Null when none is ready.
  Lane* takeNext(std::vector<Lane*>& waiting) REQUIRES(mutex_);
  // Runs pieces of the lane until its turn is over.
  void runPieces(Lane& lane);
  void setReady(Lane& lane) REQUIRES(mutex_);
  void scheduleTurn() REQUIRES(mutex_);
  void waitForRoom(Lane& lane);
  void resume(Lane& lane, bool hasRoom);
  bool hasPieces() const;
  bool isOverShare() const;
  bool isTimeOver() const;

  SerialQueue& queue_;
  const Clock& clock_;
  TimerService& timers_;

  // Used by the thread that runs the queue's work.
  Account* running_ = nullptr;
  Lane* runningLane_ = nullptr;  // null for work that runs at once
  std::chrono::nanoseconds turnBegan_{0};
  std::vector<Piece> continuations_;

  std::atomic<bool> othersWait_ = false;      // a lane is ready, beside the running one
  std::atomic<bool> mayHaveWaiting_ = false;  // a lane waits for room
  std::atomic<bool> isEnding_ = false;
  std::chrono::nanoseconds endBegan_{0};  // written before isEnding_ is set
  std::atomic<bool> mustGiveUp_ = false;

  mutable Mutex mutex_;  // held while a turn is queued, never while one runs
  // One for each account that has had work. They stay, as the accounts do (Accounts::kMaxAccounts).
  std::map<const Account*, Lane> lanes_ GUARDED_BY(mutex_);
  std::deque<Lane*> ready_ GUARDED_BY(mutex_);
  std::size_t waitingLanes_ GUARDED_BY(mutex_) = 0;
  bool isScheduled_ GUARDED_BY(mutex_) = false;  // a turn is queued or runs
  bool isClosed_ GUARDED_BY(mutex_) = false;
};

}  // namespace tonewerk
