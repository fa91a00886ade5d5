// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "bridges/pipewire/glitches/GlitchEvidence.h"

namespace tonewerk {

// Makes the evidence of a glitch by hand: player > filter > output > sink, 1,024 frames at 48 kHz. Cycle 3 is
// the glitch's. Times are in microseconds since the begin of the cycle.
class GlitchScene {
 public:
  static constexpr std::uint32_t kSink = 36;
  static constexpr std::uint32_t kPlayer = 41;
  static constexpr std::uint32_t kFilter = 42;
  static constexpr std::uint32_t kOutput = 43;
  static constexpr std::size_t kGlitch = 3;
  static constexpr std::chrono::nanoseconds kPeriod{21'333'333};

  GlitchScene() {
    evidence.driver = kSink;
    evidence.links = {{kPlayer, kFilter}, {kFilter, kOutput}, {kOutput, kSink}};
    evidence.names = {{kPlayer, "player"}, {kFilter, "filter"}, {kOutput, "output"}};
    for (const std::uint32_t node : {kPlayer, kFilter, kOutput}) evidence.usual[node] = {20'000, 10'000};
    for (std::size_t i = 0; i < 5; ++i) addInTime();
    evidence.first = evidence.last = kGlitch;
  }

  static KeptNode finished(std::uint32_t node, double signal, double awake, double finish) {
    return {node, NodeTimes::kFinished, at(signal), at(awake), at(finish)};
  }
  // It is still busy with the cycle before when this one begins, and finishes both.
  static KeptNode finishedBoth(std::uint32_t node, double signal, double finish) {
    return {node, NodeTimes::kFinished, at(signal), KeptNode::kNever, at(finish)};
  }
  static KeptNode awake(std::uint32_t node, double signal, double awake) {
    return {node, NodeTimes::kAwake, at(signal), at(awake), KeptNode::kNever};
  }
  static KeptNode signalled(std::uint32_t node, double signal) {
    return {node, NodeTimes::kSignalled, at(signal), KeptNode::kNever, KeptNode::kNever};
  }
  static KeptNode waiting(std::uint32_t node) { return {.node = node}; }

  void addInTime() {
    GlitchCycle cycle;
    cycle.cycle = {.number = evidence.cycles.size(),
                   .position = evidence.cycles.size() * 1024,
                   .begin = std::chrono::seconds(100) + kPeriod * evidence.cycles.size(),
                   .period = kPeriod,
                   .frames = 1024,
                   .hertz = 48'000};
    cycle.nodes = {finished(kPlayer, 1, 21, 31), finished(kFilter, 40, 60, 70),
                   finished(kOutput, 80, 100, 110)};
    evidence.cycles.push_back(cycle);
  }
  // What happened in a cycle; unfinished unless all have finished.
  void set(std::size_t index, std::vector<KeptNode> nodes) {
    GlitchCycle& cycle = evidence.cycles.at(index);
    cycle.cycle.isUnfinished = false;
    for (const KeptNode& node : nodes) {
      if (node.stage != NodeTimes::kFinished) cycle.cycle.isUnfinished = true;
    }
    cycle.nodes = std::move(nodes);
  }
  // One node needs so long from the begin of the glitch's cycle on; those before it are in time, those behind
  // it wait.
  void makeLate(std::uint32_t culprit, double untilMicroseconds) {
    std::vector<KeptNode> glitch;
    std::vector<KeptNode> after;
    const double busyUntil = untilMicroseconds - static_cast<double>(kPeriod.count()) / 1e3;
    double time = 1;
    bool isBehind = false;
    for (const std::uint32_t node : {kPlayer, kFilter, kOutput}) {
      if (node == culprit) {
        glitch.push_back(awake(node, time, time + 20));
        after.push_back(finished(node, time, busyUntil, busyUntil + 10));
        isBehind = true;
      } else {
        glitch.push_back(isBehind ? waiting(node) : finished(node, time, time + 20, time + 30));
        const double begin = isBehind ? busyUntil + time : time;
        after.push_back(finished(node, begin, begin + 20, begin + 30));
      }
      time += 40;
    }
    set(kGlitch, glitch);
    set(kGlitch + 1, after);
  }

  GlitchEvidence evidence;

 private:
  static std::int32_t at(double microseconds) { return static_cast<std::int32_t>(microseconds * 1e3); }
};

}  // namespace tonewerk
