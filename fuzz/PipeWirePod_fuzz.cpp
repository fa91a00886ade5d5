// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as a pod from PipeWire: a report of the profiler, a node's properties or its format. The
// pod's own size is made to match the input's, as PipeWire checks it; everything inside is as the input says.
#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <spa/pod/pod.h>
#include <string>
#include <vector>

#include "FuzzInput.h"
#include "bridges/pipewire/glitches/GlitchCyclesText.h"
#include "bridges/pipewire/glitches/GlitchJudge.h"
#include "bridges/pipewire/glitches/GlitchWatch.h"
#include "bridges/pipewire/graph/PipeWireParams.h"
#include "bridges/pipewire/graph/PipeWireProfile.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

// Follows the cycles of any numbers and times, and judges what it finds.
void watch(const std::vector<ProfiledCycle>& cycles) {
  std::size_t judged = 0;
  std::unique_ptr<GlitchWatch> watch;
  const auto judge = [&](const GlitchSpan& span) {
    expect(span.first <= span.firstNew && span.firstNew <= span.last);
    expect(span.last < watch->history().size());
    if (++judged > 8) return;
    GlitchEvidence evidence;
    for (std::size_t i = span.first; i < watch->history().size(); ++i) {
      const auto nodes = watch->history().nodes(i);
      evidence.cycles.push_back({watch->history().cycle(i), {nodes.begin(), nodes.end()}});
      for (const KeptNode& node : nodes) {
        if (const auto usual = watch->usualOf(node.node)) evidence.usual.emplace(node.node, *usual);
      }
    }
    evidence.last = span.last - span.first;
    evidence.deviceXruns = span.deviceXruns;
    const Verdict verdict = judgeGlitch(evidence);
    expect(verdict.confidence >= 0.0 && verdict.confidence <= 1.0 && !verdict.reason.empty());
    expect(std::isfinite(verdict.overMilliseconds) && verdict.overMilliseconds >= 0.0);
    expect(glitchCyclesText(evidence, [](std::uint32_t) { return std::string("p"); }).size() <=
           kMaxCyclesBytes);
  };
  watch = std::make_unique<GlitchWatch>(judge);
  for (const ProfiledCycle& cycle : cycles) watch->add(cycle);
  watch->flush();
}

void read(const spa_pod& pod) {
  const std::vector<ProfiledCycle> cycles = cyclesOf(pod);
  watch(cycles);
  for (const ProfiledCycle& cycle : cycles) {
    for (const ProfiledFollower& follower : cycle.followers) {
      expect(follower.hasFinished == (follower.times.stage == NodeTimes::kFinished));
    }
    expect(cycle.period.count() >= 0 && cycle.frames > 0);
    expect(!cycle.processing || (cycle.begin && cycle.processing->count() >= 0));
  }
  const std::optional<double> shown = volumeOf(pod).shown();
  expect(!shown || (*shown >= 0.0 && *shown <= 1.0));
  if (const auto format = formatOf(pod)) expect(isUtf8(format->text()) && format->rateHertz > 0);
}

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < sizeof(spa_pod)) return 0;
  // A block of exactly this size, so that the sanitizer sees each read behind the pod.
  const std::unique_ptr<std::uint8_t[]> bytes(new std::uint8_t[size]);
  std::memcpy(bytes.get(), data, size);
  auto* pod = reinterpret_cast<spa_pod*>(bytes.get());
  pod->size = static_cast<std::uint32_t>(size - sizeof(spa_pod));
  tonewerk::read(*pod);
  return 0;
}
