// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/glitches/GlitchWatch.h"

#include <algorithm>
#include <utility>

namespace tonewerk {

namespace {

using std::chrono::nanoseconds;

// Moves an estimate towards the median of the values that it sees.
void approach(std::int32_t& estimate, std::int32_t value, bool isFirst) {
  if (isFirst) {
    estimate = value;
    return;
  }
  const std::int32_t step = std::max(estimate / 8, 1000);
  estimate = value > estimate ? std::min(estimate + step, value) : std::max(estimate - step, value);
}

// Cycles in which a new node may still spoil those of others.
constexpr std::uint64_t kStarting = 20;

// It has been signalled and is to blame for its own cycle, unlike one that waits for others.
bool isAtWork(const KeptNode& part) {
  return part.stage == NodeTimes::kSignalled || part.stage == NodeTimes::kAwake;
}

}  // namespace

void GlitchWatch::add(const ProfiledCycle& cycle) {
  const CycleHistory::Added added = history_.add(cycle);
  if (added == CycleHistory::Added::kNothing) return;
  const std::size_t newest = history_.size() - 1;
  if (added == CycleHistory::Added::kNew) {
    if (newest > 0 && !isNewestSettled_) settle(newest - 1);
    isNewestSettled_ = false;
  }
  // The first of two reports, which only an unfinished cycle has, waits for the second.
  const bool isFinal = added == CycleHistory::Added::kAgain || !history_.cycle(newest).isUnfinished;
  if (isFinal && !std::exchange(isNewestSettled_, true)) settle(newest);
}

void GlitchWatch::flush() {
  if (history_.size() == 0) return;
  if (!std::exchange(isNewestSettled_, true)) settle(history_.size() - 1);
  if (length_ > told_) tell(history_.size() - 1, false);
  length_ = told_ = 0;
}

std::optional<UsualTimes> GlitchWatch::usualOf(std::uint32_t node) const {
  const auto found = nodes_.find(node);
  if (found == nodes_.end() || !found->second.hasFinished) return std::nullopt;
  return found->second.usual;
}

void GlitchWatch::settle(std::size_t index) {
  const KeptCycle& cycle = history_.cycle(index);
  const std::uint32_t xruns = hasXruns_ && cycle.xruns > xruns_ ? cycle.xruns - xruns_ : 0;
  hasXruns_ = true;
  xruns_ = cycle.xruns;
  // The glitch before has cut this cycle short.
  const bool isTail = cycle.isCutShort && length_ > 0;
  if (isTail || (cycle.isUnfinished && !cycle.isCutShort && isGap(index))) {
    deviceXruns_ += xruns;
    settleUnfinished(index);
  } else if (length_ > 0) {
    deviceXruns_ += xruns;  // the device often notices one cycle later
    // A cycle of very many nodes may have taken the place of all that were kept.
    if (length_ > told_ && index > 0) tell(index - 1, true);
    length_ = told_ = 0;
    deviceXruns_ = 0;
  } else if (xruns > 0) {
    onGlitch_({index, index, index, cycle.begin, cycle.number, true, xruns});
  }
  learn(index);
}

// Some nodes never finish, because no other waits for them.
bool GlitchWatch::isGap(std::size_t index) const {
  for (const KeptNode& part : history_.nodes(index)) {
    if (part.stage == NodeTimes::kFinished) continue;
    const auto node = nodes_.find(part.node);
    if (node == nodes_.end() || node->second.hasFinished || node->second.age < kStarting) return true;
  }
  return false;
}

void GlitchWatch::settleUnfinished(std::size_t index) {
  const KeptCycle& cycle = history_.cycle(index);
  if (length_ > 0 && !isSameGlitch(index)) {
    // A cycle of very many nodes may have taken the place of all that were kept.
    if (length_ > told_ && index > 0) tell(index - 1, true);
    length_ = told_ = 0;
  }
  if (length_ == 0) {
    begin_ = cycle.begin;
    number_ = cycle.number;
  }
  ++length_;
  if (cycle.end() - history_.cycle(index - std::min(length_ - told_ - 1, index)).begin >= kLongestSpan) {
    tell(index, false);
    told_ = length_;
    deviceXruns_ = 0;
  }
}

// A node that was late in the cycle before still has not answered, or took much of this cycle, too.
bool GlitchWatch::isSameGlitch(std::size_t index) const {
  const KeptCycle& cycle = history_.cycle(index);
  if (index == 0 || cycle.isCutShort) return true;
  for (const KeptNode& before : history_.nodes(index - 1)) {
    if (!isAtWork(before)) continue;
    const std::optional<KeptNode> part = history_.find(index, before.node);
    if (!part) continue;
    if (isAtWork(*part)) return true;
    const std::int32_t answer = part->awake == KeptNode::kNever ? part->finish : part->awake;
    const bool isKnown = answer != KeptNode::kNever && part->signal != KeptNode::kNever;
    if (isKnown && nanoseconds(answer - part->signal) > cycle.period / 4) return true;
  }
  return false;
}

void GlitchWatch::learn(std::size_t index) {
  const std::span<const KeptNode> parts = history_.nodes(index);
  for (const KeptNode& part : parts) {
    Node& node = nodes_[part.node];
    ++node.age;
    if (part.stage != NodeTimes::kFinished) continue;
    if (part.signal != KeptNode::kNever && part.awake != KeptNode::kNever &&
        part.finish != KeptNode::kNever) {
      approach(node.usual.wait, part.awake - part.signal, !node.hasFinished);
      approach(node.usual.compute, part.finish - part.awake, !node.hasFinished);
    }
    node.hasFinished = true;
  }
  if (nodes_.size() == parts.size()) return;
  // The graph reuses the numbers of nodes that have left.
  std::erase_if(nodes_, [&](const auto& entry) {
    return std::none_of(parts.begin(), parts.end(),
                        [&](const KeptNode& part) { return part.node == entry.first; });
  });
}

void GlitchWatch::tell(std::size_t last, bool isOver) {
  const std::size_t kept = std::min(length_, last + 1);
  const std::size_t fresh = std::min(length_ - told_, last + 1);
  onGlitch_({last + 1 - kept, last + 1 - fresh, last, begin_, number_, isOver, deviceXruns_});
}

}  // namespace tonewerk
