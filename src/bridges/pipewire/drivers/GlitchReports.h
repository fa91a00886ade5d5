// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "bridges/pipewire/drivers/NodeChannels.h"
#include "bridges/pipewire/glitches/GlitchFacts.h"
#include "bridges/pipewire/glitches/GlitchJudge.h"
#include "bridges/pipewire/glitches/GlitchWatch.h"
#include "bridges/pipewire/graph/GraphModel.h"
#include "bridges/pipewire/sessions/StreamReports.h"
#include "platform/Clock.h"

namespace tonewerk {

// Finds the graph's glitches, judges whose each was, and reports them to the streams that lost audio: those
// that did not finish their part, those whose audio goes through a node that did not, and all of a driver
// whose device ran out of data.
//
// Used on the loop's thread only.
class GlitchReports {
 public:
  static constexpr std::size_t kMaxDrivers = 16;
  static constexpr std::size_t kMaxJudged = 8;  // of one report of the profiler; others are only counted
  static constexpr std::size_t kMaxNodes = 64;  // whose loads are kept

  // All arguments outlive this object. It watches the shape of `model` until it is destroyed.
  GlitchReports(GraphModel& model, StreamReports& streams, GlitchFacts& facts, const Clock& clock);
  GlitchReports(const GlitchReports&) = delete;
  GlitchReports& operator=(const GlitchReports&) = delete;
  ~GlitchReports();

  // Cycles of any drivers, in order for each driver.
  void profiled(const std::vector<ProfiledCycle>& cycles);
  // Forgets all drivers but these, after it has told of what they did last.
  void retain(const std::set<std::uint32_t>& drivers);
  // Tells of all glitches that are known, because a stream's session ends.
  void streamLeaves(std::uint32_t stream);

  // Of the nodes that took part in cycles lately.
  std::vector<NodeLoad> loads() const;

 private:
  struct Driver {
    std::unique_ptr<GlitchWatch> watch;
    std::chrono::nanoseconds glitchBegin{0};  // of the glitch that was told of last
    std::string glitchID;
    bool wasUnfinished = false;                    // in the newest cycle
    std::map<std::uint32_t, std::uint32_t> xruns;  // that PipeWire counted for each follower until then
  };
  // What a node did in the seconds that the profiler reported.
  struct Load {
    std::int64_t cycles = 0;
    std::int64_t sum = 0;              // of the cycles' shares of the period, per mille
    std::int64_t worst = 0;            // of this report
    std::int64_t busy = 0;             // of the report before
    std::vector<std::int64_t> worsts;  // of the last reports
    std::int64_t glitches = 0;
    std::chrono::nanoseconds seenAt{0};
  };
  struct RemovedLink {
    NodeLink link;
    std::chrono::nanoseconds at;
  };

  void shapeChanged();
  GlitchWatch* watchOf(std::uint32_t driver);
  void rememberOwners(const std::vector<ProfiledCycle>& cycles);
  void reportCounted(const ProfiledCycle& cycle);
  void measure(const ProfiledCycle& cycle);
  void endMeasuring();
  void onGlitch(std::uint32_t driver, const GlitchSpan& span);
  GlitchEvidence evidenceOf(std::uint32_t driver, const GlitchWatch& watch, const GlitchSpan& span) const;
  std::vector<NodeLink> linksSince(std::chrono::nanoseconds time) const;
  const NodeOwner& ownerOf(std::uint32_t node) const;
  std::string processNameOf(const NodeOwner& owner) const;
  double wallTimeOf(std::chrono::nanoseconds monotonic) const;
  ValueMap valuesOf(const GlitchEvidence& evidence, const Verdict& verdict, const std::string& id) const;

  GraphModel& model_;
  StreamReports& streams_;
  GlitchFacts& facts_;
  const Clock& clock_;
  std::map<std::uint32_t, Driver> drivers_;
  std::map<std::uint32_t, NodeOwner> owners_;  // of the nodes in the last cycles, and of some that have left
  std::map<std::uint32_t, Load> loads_;
  std::vector<NodeLink> links_;
  std::vector<RemovedLink> removedLinks_;
  std::vector<std::chrono::nanoseconds> shapeChanges_;  // the last ones, ascending
  std::size_t judged_ = 0;                              // of the present report
};

}  // namespace tonewerk
