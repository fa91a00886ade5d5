// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/glitches/CycleHistory.h"

#include <algorithm>

namespace tonewerk {

namespace {

using std::chrono::nanoseconds;

// A longer time does not fit a KeptNode, and says no more than that it was very long.
constexpr nanoseconds kMaxDistance = std::chrono::seconds(2);
// Two reports of one cycle have the same begin, except that one takes it from the driver's clock.
constexpr nanoseconds kSameBegin = std::chrono::milliseconds(1);

std::int32_t sinceBegin(const std::optional<nanoseconds>& time, nanoseconds begin) {
  if (!time) return KeptNode::kNever;
  const nanoseconds distance = *time - begin;
  if (distance > kMaxDistance || distance < -kMaxDistance) return KeptNode::kNever;
  return static_cast<std::int32_t>(distance.count());
}

nanoseconds distanceOf(nanoseconds a, nanoseconds b) { return a > b ? a - b : b - a; }

}  // namespace

CycleHistory::CycleHistory() : slots_(kMaxCycles), parts_(kMaxParts) {}

CycleHistory::Added CycleHistory::add(const ProfiledCycle& cycle) {
  if (!cycle.begin) return Added::kNothing;
  nanoseconds begin = *cycle.begin;
  bool isFirst = false;  // of two reports
  if (count_ > 0) {
    Slot& newest = at(count_ - 1);
    const bool isSamePosition = newest.cycle.position == cycle.position;
    if (newest.cycle.isUnfinished && !newest.isAgain && isSamePosition &&
        distanceOf(newest.cycle.begin, begin) < kSameBegin) {
      // The better times of the newest cycle, whose nodes are the last ones in parts_.
      nextPart_ = newest.first;
      --count_;
      keep(cycle, begin, true);
      Slot& again = at(count_ - 1);
      again.isAgain = true;
      return Added::kAgain;
    }
    // The first report of an unfinished cycle has the begin of the cycle before it.
    if (begin == newest.cycle.begin && cycle.processing) {
      begin += *cycle.processing;
      isFirst = true;
    }
    if (begin <= newest.cycle.begin) {
      if (newest.cycle.begin - begin < kMaxDistance) return Added::kNothing;
      count_ = 0;  // the clock of another driver with the same number
    }
  }
  keep(cycle, begin, isFirst);
  return Added::kNew;
}

std::span<const KeptNode> CycleHistory::nodes(std::size_t index) const {
  const Slot& slot = at(index);
  return {parts_.data() + slot.first, slot.count};
}

std::optional<KeptNode> CycleHistory::find(std::size_t index, std::uint32_t node) const {
  for (const KeptNode& part : nodes(index)) {
    if (part.node == node) return part;
  }
  return std::nullopt;
}

void CycleHistory::dropOldest() {
  oldest_ = (oldest_ + 1) % kMaxCycles;
  --count_;
}

void CycleHistory::keep(const ProfiledCycle& cycle, nanoseconds begin, bool isLate) {
  const std::size_t size = std::min(cycle.followers.size(), kMaxNodes);
  const std::size_t room = std::max<std::size_t>(size, 1);  // so that no two slots begin at the same part
  if (nextPart_ + room > kMaxParts) {
    // The slots behind are the oldest.
    while (count_ > 0 && at(0).first >= nextPart_) dropOldest();
    nextPart_ = 0;
  }
  if (count_ == kMaxCycles) dropOldest();
  const auto isInTheWay = [&](const Slot& oldest) {
    return oldest.first >= nextPart_ && oldest.first < nextPart_ + room;
  };
  while (count_ > 0 && isInTheWay(at(0))) dropOldest();

  Slot& slot = at(count_);
  slot = {{cycle.number, cycle.position, begin, cycle.period, cycle.frames, cycle.hertz, cycle.xruns, isLate,
           false},
          nextPart_,
          size,
          false};
  for (std::size_t i = 0; i < size; ++i) {
    const ProfiledFollower& follower = cycle.followers[i];
    const auto stage = follower.hasFinished ? NodeTimes::kFinished : follower.times.stage;
    parts_[nextPart_ + i] = {follower.node, stage, sinceBegin(follower.times.signal, begin),
                             sinceBegin(follower.times.awake, begin),
                             sinceBegin(follower.times.finish, begin)};
    if (!follower.hasFinished) slot.cycle.isUnfinished = true;
  }
  if (slot.cycle.isUnfinished && !isLate && cycle.processing) {
    slot.cycle.isCutShort = *cycle.processing < cycle.period * 9 / 10;
  }
  nextPart_ += room;
  ++count_;
}

}  // namespace tonewerk
