// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <utility>

#include "bridges/pipewire/glitches/CycleHistory.h"
#include "bridges/pipewire/glitches/GlitchEvidence.h"

namespace tonewerk {

// Some cycles in a row that one and the same node, or several, left unfinished. Indices are those of
// history().
struct GlitchSpan {
  std::size_t first =
      0;  // of the glitch; a cycle of that number may have been forgotten when it is very long
  std::size_t firstNew = 0;  // of those that were not in an earlier span of the same glitch
  std::size_t last = 0;
  std::chrono::nanoseconds begin{0};  // of the glitch's first cycle
  std::uint64_t number = 0;           // of the glitch's first cycle
  bool isOver = false;                // a later cycle, which these nodes finished or did not spoil, is there
  std::uint32_t deviceXruns = 0;      // that the driver counted in these cycles
};

// Follows the cycles of one driver and finds its glitches. An unfinished cycle counts when it has been
// reported twice, or when the next one has begun.
//
// A glitch that lasts is told of in parts, so that it becomes known while it lasts.
class GlitchWatch {
 public:
  static constexpr std::chrono::seconds kLongestSpan{1};

  using OnGlitch = std::function<void(const GlitchSpan&)>;

  // `onGlitch` may use this object's const functions.
  explicit GlitchWatch(OnGlitch onGlitch) : onGlitch_(std::move(onGlitch)) {}

  void add(const ProfiledCycle& cycle);
  // Tells of a glitch that is not over yet; no more cycles may come.
  void flush();

  const CycleHistory& history() const { return history_; }
  // None for a node that has not finished a cycle since it came.
  [[nodiscard]] std::optional<UsualTimes> usualOf(std::uint32_t node) const;

 private:
  struct Node {
    UsualTimes usual;
    bool hasFinished = false;
    std::uint64_t age = 0;  // in cycles
  };

  void settle(std::size_t index);
  bool isGap(std::size_t index) const;
  void settleUnfinished(std::size_t index);
  bool isSameGlitch(std::size_t index) const;
  void learn(std::size_t index);
  void tell(std::size_t last, bool isOver);

  OnGlitch onGlitch_;
  CycleHistory history_;
  bool isNewestSettled_ = false;
  std::map<std::uint32_t, Node> nodes_;  // those of the newest settled cycle
  bool hasXruns_ = false;
  std::uint32_t xruns_ = 0;  // of the driver in the newest settled cycle
  // The glitch that is not over yet.
  std::size_t length_ = 0;  // of all its cycles; 0 for none
  std::size_t told_ = 0;    // how many of these are known
  std::chrono::nanoseconds begin_{0};
  std::uint64_t number_ = 0;
  std::uint32_t deviceXruns_ = 0;
};

}  // namespace tonewerk
