// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PipeWireProfile.h"

#include <spa/param/profiler.h>
#include <spa/pod/iter.h>
#include <spa/pod/parser.h>

#include "bridges/pipewire/graph/PodCheck.h"

namespace tonewerk {

namespace {

using std::chrono::nanoseconds;

// Limits far above the values of any real graph. Clients can write to the memory that these numbers come
// from.
constexpr std::int64_t kMaxFrames = 1 << 20;
constexpr std::uint32_t kMaxHertz = 1 << 24;
constexpr nanoseconds kMaxDuration = std::chrono::seconds(60);

// Activation status of a node in its cycle. One that no cycle has triggered yet has another status.
constexpr std::int32_t kTriggered = 1;
constexpr std::int32_t kWoken = 2;
constexpr std::int32_t kDone = 3;

struct NodeBlock {
  std::int32_t node = 0;
  // Monotonic nanoseconds. Until the node has reached that point of its cycle, they are of an earlier one.
  std::int64_t signal = 0;
  std::int64_t awake = 0;
  std::int64_t finish = 0;
  std::int32_t status = 0;
  std::int32_t xruns = -1;  // -1 in earlier releases of PipeWire, which do not count them
};

std::optional<NodeBlock> nodeBlockOf(const spa_pod& pod) {
  NodeBlock block;
  const char* name = nullptr;
  std::int64_t previousSignal = 0;
  spa_fraction latency{};
  const int result = spa_pod_parse_struct(
      &pod, SPA_POD_Int(&block.node), SPA_POD_String(&name), SPA_POD_Long(&previousSignal),
      SPA_POD_Long(&block.signal), SPA_POD_Long(&block.awake), SPA_POD_Long(&block.finish),
      SPA_POD_Int(&block.status), SPA_POD_Fraction(&latency), SPA_POD_OPT_Int(&block.xruns));
  if (result < 0) return std::nullopt;
  return block;
}

bool readInfo(const spa_pod& pod, ProfiledCycle& cycle) {
  std::int64_t number = 0;
  std::int32_t xruns = 0;
  float load = 0;
  const int result = spa_pod_parse_struct(&pod, SPA_POD_Long(&number), SPA_POD_Float(&load),
                                          SPA_POD_Float(&load), SPA_POD_Float(&load), SPA_POD_Int(&xruns));
  if (result < 0) return false;
  cycle.number = static_cast<std::uint64_t>(number);
  cycle.xruns = static_cast<std::uint32_t>(xruns);
  return true;
}

bool readClock(const spa_pod& pod, ProfiledCycle& cycle) {
  std::int32_t flags = 0;
  std::int32_t identifier = 0;
  const char* name = nullptr;
  std::int64_t time = 0;
  spa_fraction rate{};
  std::int64_t position = 0;
  std::int64_t frames = 0;
  const int result = spa_pod_parse_struct(&pod, SPA_POD_Int(&flags), SPA_POD_Int(&identifier),
                                          SPA_POD_String(&name), SPA_POD_Long(&time), SPA_POD_Fraction(&rate),
                                          SPA_POD_Long(&position), SPA_POD_Long(&frames));
  if (result < 0 || frames <= 0 || frames > kMaxFrames) return false;
  if (rate.num == 0 || rate.denom == 0 || rate.num > kMaxHertz || rate.denom > kMaxHertz) return false;
  const double seconds = static_cast<double>(frames) * rate.num / rate.denom;
  if (seconds > std::chrono::duration<double>(kMaxDuration).count()) return false;
  cycle.frames = static_cast<std::uint32_t>(frames);
  cycle.position = static_cast<std::uint64_t>(position);
  cycle.period = nanoseconds(static_cast<std::int64_t>(seconds * 1e9));
  cycle.hertz = rate.denom / rate.num;
  return true;
}

bool readDriver(const spa_pod& pod, ProfiledCycle& cycle) {
  const std::optional<NodeBlock> block = nodeBlockOf(pod);
  if (!block) return false;
  cycle.driver = static_cast<std::uint32_t>(block->node);
  if (block->signal <= 0) return true;
  cycle.begin = nanoseconds(block->signal);
  if (block->finish < block->signal || block->finish - block->signal > kMaxDuration.count()) return true;
  cycle.processing = nanoseconds(block->finish - block->signal);
  return true;
}

std::optional<nanoseconds> timeOf(std::int64_t value) {
  return value > 0 ? std::optional(nanoseconds(value)) : std::nullopt;
}

NodeTimes timesOf(const NodeBlock& block) {
  NodeTimes times;
  if (block.status < kTriggered || block.status > kDone) return times;
  times.stage = static_cast<NodeTimes::Stage>(block.status);
  times.signal = timeOf(block.signal);
  if (block.status >= kWoken && block.awake >= block.signal) times.awake = timeOf(block.awake);
  if (block.status >= kDone && block.finish >= block.signal) times.finish = timeOf(block.finish);
  return times;
}

void addFollower(const spa_pod& pod, ProfiledCycle& cycle) {
  const std::optional<NodeBlock> block = nodeBlockOf(pod);
  if (!block) return;
  ProfiledFollower follower{static_cast<std::uint32_t>(block->node), block->status == kDone, std::nullopt,
                            timesOf(*block)};
  if (block->xruns >= 0) follower.xruns = static_cast<std::uint32_t>(block->xruns);
  cycle.followers.push_back(follower);
}

// The object's parts come in any order. Information, clock and driver must be there.
std::optional<ProfiledCycle> cycleOf(const spa_pod_object& object) {
  ProfiledCycle cycle;
  bool hasInfo = false;
  bool hasClock = false;
  bool hasDriver = false;
  for (const spa_pod_prop* part = spa_pod_prop_first(&object.body);
       spa_pod_prop_is_inside(&object.body, object.pod.size, part); part = spa_pod_prop_next(part)) {
    if (part->key == SPA_PROFILER_info) hasInfo = readInfo(part->value, cycle);
    if (part->key == SPA_PROFILER_clock) hasClock = readClock(part->value, cycle);
    if (part->key == SPA_PROFILER_driverBlock) hasDriver = readDriver(part->value, cycle);
    if (part->key == SPA_PROFILER_followerBlock) addFollower(part->value, cycle);
  }
  if (!hasInfo || !hasClock || !hasDriver) return std::nullopt;
  return cycle;
}

}  // namespace

std::vector<ProfiledCycle> cyclesOf(const spa_pod& profile) {
  std::vector<ProfiledCycle> cycles;
  if (!spa_pod_is_struct(&profile) || !isWellFormed(profile)) return cycles;
  const void* body = SPA_POD_BODY_CONST(&profile);
  for (auto* pod = static_cast<const spa_pod*>(body); spa_pod_is_inside(body, profile.size, pod);
       pod = static_cast<const spa_pod*>(spa_pod_next(pod))) {
    if (!spa_pod_is_object_type(pod, SPA_TYPE_OBJECT_Profiler)) continue;
    if (auto cycle = cycleOf(*reinterpret_cast<const spa_pod_object*>(pod)))
      cycles.push_back(*std::move(cycle));
  }
  return cycles;
}

}  // namespace tonewerk
