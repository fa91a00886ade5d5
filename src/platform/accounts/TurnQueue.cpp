// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/TurnQueue.h"

#include <algorithm>
#include <cassert>
#include <iterator>
#include <utility>

#include "platform/Clock.h"
#include "platform/TimerService.h"

namespace tonewerk {

TurnQueue::TurnQueue(SerialQueue& queue, const Clock& clock, TimerService& timers)
    : queue_(queue), clock_(clock), timers_(timers) {}

TurnQueue::~TurnQueue() = default;

void TurnQueue::add(const std::shared_ptr<Account>& account, Piece piece) {
  const MutexLock lock(mutex_);
  if (isClosed_) return;
  Lane& lane = lanes_[account.get()];
  if (lane.account == nullptr) lane.account = account;
  lane.pieces.push_back(std::move(piece));
  if (lane.state != Lane::State::kIdle) return;
  if (lane.deficit < std::chrono::nanoseconds::zero()) {  // the time without work has paid for it
    const std::chrono::nanoseconds paid = clock_.monotonic() - lane.idleSince;
    lane.deficit = std::min(std::chrono::nanoseconds::zero(), lane.deficit + paid);
  }
  setReady(lane);
}

void TurnQueue::run(const std::shared_ptr<Account>& account, Piece piece) {
  if (!queue_.isCurrent() || running_ != nullptr) return add(account, std::move(piece));
  const WorkingFor scope(account);
  while (piece() == Progress::kMore) {
  }
}

void TurnQueue::setReady(Lane& lane) {
  lane.state = Lane::State::kReady;
  ready_.push_back(&lane);
  othersWait_ = true;
  scheduleTurn();
}

void TurnQueue::scheduleTurn() {
  if (isScheduled_ || isClosed_ || ready_.empty()) return;
  isScheduled_ = true;
  queue_.async([self = shared_from_this()] { self->runTurn(); });
}

void TurnQueue::runTurn() {
  std::vector<Lane*> waiting;
  Lane* lane = nullptr;
  {
    const MutexLock lock(mutex_);
    lane = takeNext(waiting);
  }
  for (Lane* without : waiting) waitForRoom(*without);
  if (lane != nullptr) runPieces(*lane);
  const MutexLock lock(mutex_);
  isScheduled_ = false;
  scheduleTurn();
}

TurnQueue::Lane* TurnQueue::takeNext(std::vector<Lane*>& waiting) {
  Lane* next = nullptr;
  while (next == nullptr && !ready_.empty()) {
    Lane& lane = *ready_.front();
    ready_.pop_front();
    if (!isEnding_ && !lane.hasWaitedLong && !lane.account->hasRoom(Resource::kSinkBytes)) {
      lane.state = Lane::State::kWaiting;
      ++waitingLanes_;
      waiting.push_back(&lane);
      continue;
    }
    lane.deficit = ready_.empty() ? std::chrono::nanoseconds(kTurn) : lane.deficit + kTurn;
    if (lane.deficit > std::chrono::nanoseconds::zero()) {
      next = &lane;
    } else {
      ready_.push_back(&lane);
    }
  }
  if (next != nullptr) next->state = Lane::State::kRunning;
  mayHaveWaiting_ = waitingLanes_ > 0;
  othersWait_ = !ready_.empty();
  return next;
}

void TurnQueue::runPieces(Lane& lane) {
  turnBegan_ = clock_.monotonic();
  if (isEnding_ && turnBegan_ - endBegan_ > kLongestFinish) mustGiveUp_ = true;
  running_ = lane.account.get();
  runningLane_ = &lane;
  const WorkingFor scope(lane.account);
  bool isOver = false;
  while (!isOver) {
    Piece piece;
    {
      const MutexLock lock(mutex_);
      if (lane.pieces.empty()) break;
      piece = std::move(lane.pieces.front());
      lane.pieces.pop_front();
    }
    const bool isDone = piece() == Progress::kDone;
    if (isDone) piece = nullptr;  // destroyed without the lock
    isOver = !isDone || isTurnOver() || isTimeOver();
    const MutexLock lock(mutex_);
    if (!isDone) lane.pieces.push_front(std::move(piece));
    lane.pieces.insert(lane.pieces.begin(), std::make_move_iterator(continuations_.begin()),
                       std::make_move_iterator(continuations_.end()));
    continuations_.clear();
  }
  running_ = nullptr;
  runningLane_ = nullptr;
  const std::chrono::nanoseconds debt = -kLargestDebt;
  const std::chrono::nanoseconds now = clock_.monotonic();
  const MutexLock lock(mutex_);
  // A user saves no time for later.
  lane.deficit = std::clamp(lane.deficit - (now - turnBegan_), debt, std::chrono::nanoseconds::zero());
  lane.state = Lane::State::kIdle;
  lane.idleSince = now;
  if (!lane.pieces.empty()) setReady(lane);
}

void TurnQueue::waitForRoom(Lane& lane) {
  {
    const MutexLock lock(mutex_);
    lane.timer = timers_.repeat(kLongestWait, [weak = weak_from_this(), &lane] {
      if (const auto self = weak.lock()) self->resume(lane, false);
    });
  }
  lane.account->whenRoom(Resource::kSinkBytes, [weak = weak_from_this(), &lane] {
    if (const auto self = weak.lock()) self->resume(lane, true);
  });
}

void TurnQueue::resume(Lane& lane, bool hasRoom) {
  const MutexLock lock(mutex_);
  if (hasRoom) lane.hasWaitedLong = false;
  if (lane.state != Lane::State::kWaiting) return;
  lane.hasWaitedLong = !hasRoom;
  lane.timer = nullptr;
  --waitingLanes_;
  setReady(lane);  // takeNext() clears mayHaveWaiting_: until then nothing may run before the lane's work
}

bool TurnQueue::continueFirst(Piece& piece) {
  if (runningLane_ == nullptr) return false;
  continuations_.push_back(std::move(piece));
  return true;
}

bool TurnQueue::isOverShare() const {
  return !isEnding_.load(std::memory_order_relaxed) &&
         (runningLane_ == nullptr || !runningLane_->hasWaitedLong) &&
         !running_->hasRoom(Resource::kSinkBytes);
}

// Work that runs at once has no turn of its own.
bool TurnQueue::isTimeOver() const {
  return runningLane_ == nullptr || clock_.monotonic() - turnBegan_ >= kTurn;
}

bool TurnQueue::hasPieces() const {
  const MutexLock lock(mutex_);
  return isScheduled_;
}

void TurnQueue::finish() {
  if (!isEnding_) endBegan_ = clock_.monotonic();
  isEnding_ = true;
  std::vector<Lane*> waiting;
  {
    const MutexLock lock(mutex_);
    for (auto& [account, lane] : lanes_) waiting.push_back(&lane);
  }
  for (Lane* lane : waiting) resume(*lane, true);
  while (hasPieces()) queue_.drain();
}

void TurnQueue::close() {
  std::vector<Piece> dropped;  // destroyed without the lock
  const MutexLock lock(mutex_);
  isClosed_ = true;
  ready_.clear();
  for (auto& [account, lane] : lanes_) {
    lane.timer = nullptr;
    std::move(lane.pieces.begin(), lane.pieces.end(), std::back_inserter(dropped));
    lane.pieces.clear();
  }
}

}  // namespace tonewerk
