// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/GlitchReports.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

#include "bridges/pipewire/ReportingVocabulary.h"
#include "bridges/pipewire/glitches/GlitchCyclesText.h"
#include "bridges/pipewire/sessions/Overload.h"
#include "values/Value.h"

namespace tonewerk {

namespace {

using std::chrono::nanoseconds;

// Profiles arrive about a second late, and a glitch is told of when it is over. A cycle older than this comes
// from a clock that is not the system's monotonic one.
constexpr nanoseconds kMaxAge = std::chrono::seconds(10);
constexpr nanoseconds kKeptLinks = std::chrono::seconds(5);
constexpr std::size_t kMaxRemovedLinks = 128;
constexpr std::size_t kMaxShapeChanges = 32;
constexpr std::size_t kMaxOwners = 512;
constexpr std::size_t kMinute = 60;  // reports of the profiler, one a second

// The cycles of a long glitch that are looked at.
constexpr std::size_t kBefore = 3;
constexpr std::size_t kFirstOnes = 8;
constexpr std::size_t kLastOnes = 4;

double millisecondsOf(nanoseconds time) { return std::chrono::duration<double, std::milli>(time).count(); }

// All nodes behind this one.
std::set<std::uint32_t> behind(const std::vector<NodeLink>& links, std::uint32_t node) {
  std::set<std::uint32_t> found;
  std::vector<std::uint32_t> open{node};
  while (!open.empty()) {
    const std::uint32_t from = open.back();
    open.pop_back();
    for (const NodeLink& link : links) {
      if (link.output == from && link.input != node && found.insert(link.input).second) {
        open.push_back(link.input);
      }
    }
  }
  return found;
}

}  // namespace

GlitchReports::GlitchReports(GraphModel& model, StreamReports& streams, GlitchFacts& facts,
                             const Clock& clock)
    : model_(model), streams_(streams), facts_(facts), clock_(clock), links_(model.nodeLinks()) {
  model_.watchShape([this] { shapeChanged(); });
}

GlitchReports::~GlitchReports() {
  model_.watchShape([] {});
}

void GlitchReports::profiled(const std::vector<ProfiledCycle>& cycles) {
  if (cycles.empty()) return;
  judged_ = 0;
  rememberOwners(cycles);
  for (const ProfiledCycle& cycle : cycles) {
    GlitchWatch* watch = watchOf(cycle.driver);
    if (watch == nullptr) continue;
    watch->add(cycle);
    reportCounted(cycle);
    measure(cycle);
  }
  endMeasuring();
}

void GlitchReports::retain(const std::set<std::uint32_t>& drivers) {
  judged_ = 0;
  for (auto driver = drivers_.begin(); driver != drivers_.end();) {
    if (drivers.contains(driver->first)) {
      ++driver;
      continue;
    }
    driver->second.watch->flush();
    driver = drivers_.erase(driver);
  }
  if (!drivers_.empty()) return;
  loads_.clear();
  owners_.clear();
}

void GlitchReports::streamLeaves(std::uint32_t stream) {
  judged_ = 0;
  for (auto& [identifier, driver] : drivers_) {
    const CycleHistory& history = driver.watch->history();
    if (history.size() > 0 && history.find(history.size() - 1, stream)) driver.watch->flush();
  }
}

std::vector<NodeLoad> GlitchReports::loads() const {
  std::vector<NodeLoad> loads;
  for (const auto& [node, load] : loads_) {
    const NodeOwner& owner = ownerOf(node);
    if (owner.name.empty()) continue;
    const auto worst = std::max_element(load.worsts.begin(), load.worsts.end());
    loads.push_back(
        {owner.name, owner.process, load.busy, worst == load.worsts.end() ? 0 : *worst, load.glitches});
  }
  return loads;
}

void GlitchReports::shapeChanged() {
  const nanoseconds now = clock_.monotonic();
  std::vector<NodeLink> links = model_.nodeLinks();
  for (const NodeLink& link : links_) {
    if (!std::binary_search(links.begin(), links.end(), link)) removedLinks_.push_back({link, now});
  }
  links_ = std::move(links);
  const std::size_t excess = std::max(removedLinks_.size(), kMaxRemovedLinks) - kMaxRemovedLinks;
  removedLinks_.erase(removedLinks_.begin(), removedLinks_.begin() + static_cast<std::ptrdiff_t>(excess));
  std::erase_if(removedLinks_, [&](const RemovedLink& link) { return now - link.at > kKeptLinks; });
  if (shapeChanges_.size() == kMaxShapeChanges) shapeChanges_.erase(shapeChanges_.begin());
  shapeChanges_.push_back(now);
}

GlitchWatch* GlitchReports::watchOf(std::uint32_t driver) {
  const auto found = drivers_.find(driver);
  if (found != drivers_.end()) return found->second.watch.get();
  if (drivers_.size() >= kMaxDrivers) return nullptr;
  Driver& made = drivers_[driver];
  made.watch =
      std::make_unique<GlitchWatch>([this, driver](const GlitchSpan& span) { onGlitch(driver, span); });
  return made.watch.get();
}

void GlitchReports::rememberOwners(const std::vector<ProfiledCycle>& cycles) {
  std::set<std::uint32_t> nodes;
  for (const ProfiledCycle& cycle : cycles) {
    nodes.insert(cycle.driver);
    for (const ProfiledFollower& follower : cycle.followers) nodes.insert(follower.node);
  }
  if (owners_.size() + nodes.size() > kMaxOwners) owners_.clear();
  std::set<std::int32_t> processes;
  for (const std::uint32_t node : nodes) {
    NodeOwner owner = model_.ownerOf(node);
    if (owner.name.empty()) continue;  // it has left
    if (owner.computingProcess != 0) processes.insert(owner.computingProcess);
    NodeOwner& known = owners_[node];
    // The graph reuses the numbers of nodes that have left.
    if (known.name != owner.name || known.process != owner.process) loads_.erase(node);
    known = std::move(owner);
  }
  const std::vector<std::int32_t> list(processes.begin(), processes.end());
  facts_.audioRuns(list);
}

void GlitchReports::measure(const ProfiledCycle& cycle) {
  if (cycle.period.count() <= 0) return;
  for (const ProfiledFollower& follower : cycle.followers) {
    const NodeTimes& times = follower.times;
    if (!follower.hasFinished || !times.awake || !times.finish || *times.finish < *times.awake) continue;
    const auto known = loads_.find(follower.node);
    if (known == loads_.end() && loads_.size() >= kMaxNodes) continue;
    Load& load = known == loads_.end() ? loads_[follower.node] : known->second;
    const std::int64_t share =
        std::min<std::int64_t>((*times.finish - *times.awake) * 1000 / cycle.period, 1'000'000);
    ++load.cycles;
    load.sum += share;
    load.worst = std::max(load.worst, share);
  }
}

// Later releases of PipeWire count the xruns of each node, also such as no cycle shows.
void GlitchReports::reportCounted(const ProfiledCycle& cycle) {
  Driver& driver = drivers_.at(cycle.driver);
  const bool isUnfinished =
      std::any_of(cycle.followers.begin(), cycle.followers.end(),
                  [](const ProfiledFollower& follower) { return !follower.hasFinished; });
  const bool isShown = isUnfinished || driver.wasUnfinished;
  driver.wasUnfinished = isUnfinished;
  std::map<std::uint32_t, std::uint32_t> counts;
  for (const ProfiledFollower& follower : cycle.followers) {
    if (!follower.xruns) continue;
    counts[follower.node] = *follower.xruns;
    const auto before = driver.xruns.find(follower.node);
    if (isShown || before == driver.xruns.end() || *follower.xruns <= before->second) continue;
    streams_.streamOverloaded(follower.node, {wallTimeOf(cycle.begin.value_or(clock_.monotonic())),
                                              cycle.frames,
                                              cycle.number,
                                              *follower.xruns - before->second,
                                              {}});
  }
  driver.xruns = std::move(counts);
}

void GlitchReports::endMeasuring() {
  const nanoseconds now = clock_.monotonic();
  for (auto& [node, load] : loads_) {
    if (load.cycles > 0) {
      load.seenAt = now;
      load.busy = load.sum / load.cycles;
    } else {
      load.busy = 0;
    }
    if (load.worsts.size() == kMinute) load.worsts.erase(load.worsts.begin());
    load.worsts.push_back(load.worst);
    load.cycles = load.sum = load.worst = 0;
  }
  std::erase_if(loads_,
                [&](const auto& entry) { return now - entry.second.seenAt > std::chrono::minutes(1); });
}

void GlitchReports::onGlitch(std::uint32_t driver, const GlitchSpan& span) {
  Driver& known = drivers_.at(driver);
  const GlitchWatch& watch = *known.watch;
  const CycleHistory& history = watch.history();
  const KeptCycle& firstNew = history.cycle(span.firstNew);
  if (known.glitchID.empty() || known.glitchBegin != span.begin) {
    known.glitchBegin = span.begin;
    known.glitchID =
        std::to_string(std::llround(wallTimeOf(span.begin) * 1e3)) + "-" + std::to_string(span.number);
  }
  const std::vector<NodeLink> links = linksSince(firstNew.begin);

  // How many cycles each stream lost, and the first node through which it did.
  struct Loss {
    std::uint32_t cycles = 0;
    std::uint32_t through = 0;
    std::set<std::uint32_t> behind;
  };
  std::map<std::uint32_t, Loss> losses;
  for (const KeptNode& part : history.nodes(span.firstNew)) {
    if (!ownerOf(part.node).isOutputStream || !watch.usualOf(part.node)) continue;
    losses[part.node].behind = behind(links, part.node);
  }
  for (auto& [stream, loss] : losses) {
    for (std::size_t i = span.firstNew; i <= span.last; ++i) {
      std::uint32_t through = 0;
      for (const KeptNode& part : history.nodes(i)) {
        if (part.stage == NodeTimes::kFinished) continue;
        if (part.node == stream) through = stream;
        if (through == 0 && loss.behind.contains(part.node)) through = part.node;
      }
      if (through == 0) continue;
      ++loss.cycles;
      if (loss.through == 0) loss.through = through;
    }
    if (span.deviceXruns > 0) {
      loss.cycles = std::max(loss.cycles, span.deviceXruns);
      if (loss.through == 0) loss.through = driver;
    }
  }
  std::erase_if(losses, [](const auto& entry) { return entry.second.cycles == 0; });
  if (losses.empty()) return;

  const double time = wallTimeOf(firstNew.begin);
  Overload overload{time, firstNew.frames, firstNew.number, 0, {}};
  if (judged_ >= kMaxJudged) {
    for (const auto& [stream, loss] : losses) {
      overload.xruns = loss.cycles;
      streams_.streamOverloaded(stream, overload);
    }
    return;
  }
  ++judged_;
  const GlitchEvidence evidence = evidenceOf(driver, watch, span);
  const Verdict verdict = judgeGlitch(evidence);
  const ValueMap shared = valuesOf(evidence, verdict, known.glitchID);
  if (verdict.culprit != 0) {
    const auto load = loads_.find(verdict.culprit);
    if (load != loads_.end()) {
      ++load->second.glitches;
      const double share =
          1000.0 + verdict.overMilliseconds / std::max(millisecondsOf(firstNew.period), 0.001) * 1000.0;
      if (verdict.cause == GlitchCause::kLate) {
        load->second.worst = std::max(load->second.worst, static_cast<std::int64_t>(share));
      }
    }
  }
  for (const auto& [stream, loss] : losses) {
    const bool isOwn =
        verdict.culprit == 0 || verdict.culprit == stream || loss.behind.contains(verdict.culprit);
    const GlitchCause cause = isOwn ? verdict.cause : GlitchCause::kWaiting;
    ValueMap values = shared;
    values.set(kGlitchCauseKey, textOf(cause));
    values.set(kGlitchNodeKey, ownerOf(loss.through).name);
    std::string chain;
    const std::uint32_t begin = isOwn ? stream : verdict.culprit;
    const std::vector<std::uint32_t> way = wayThrough(links, begin, driver);
    for (const std::uint32_t node : way) chain += (chain.empty() ? "" : " > ") + ownerOf(node).name;
    if (way.size() > 2) values.set(kGlitchChainKey, chain);
    overload.xruns = loss.cycles;
    overload.verdict = {std::string(textOf(verdict.cause)) + " " + std::to_string(verdict.culprit) + " " +
                            std::to_string(verdict.holder),
                        verdict.overMilliseconds, millisecondsOf(firstNew.period) * loss.cycles,
                        std::move(values)};
    streams_.streamOverloaded(stream, overload);
  }
}

GlitchEvidence GlitchReports::evidenceOf(std::uint32_t driver, const GlitchWatch& watch,
                                         const GlitchSpan& span) const {
  const CycleHistory& history = watch.history();
  GlitchEvidence evidence;
  evidence.driver = driver;
  evidence.isOver = span.isOver;
  evidence.deviceXruns = span.deviceXruns;
  const std::size_t begin = span.first - std::min(span.first, kBefore);
  // The cycle after the last shows when a late node was done.
  const std::size_t end = std::min(span.last + 1 + (span.isOver ? 1 : 0), history.size());
  for (std::size_t i = begin; i < end; ++i) {
    if (i >= span.first + kFirstOnes && i + kLastOnes < end) continue;
    if (i == span.first) evidence.first = evidence.cycles.size();
    if (i == span.last) evidence.last = evidence.cycles.size();
    const auto nodes = history.nodes(i);
    evidence.cycles.push_back({history.cycle(i), {nodes.begin(), nodes.end()}});
  }
  const GlitchCycle& glitch = evidence.cycles[evidence.first];
  const nanoseconds from = glitch.cycle.begin;
  const nanoseconds to = evidence.cycles.back().cycle.end();
  evidence.links = linksSince(from);
  evidence.shapeChanges = shapeChanges_;
  std::map<std::int32_t, nanoseconds> usual;  // how long the nodes of a process usually compute in a cycle
  for (const GlitchCycle& cycle : evidence.cycles) {
    for (const KeptNode& part : cycle.nodes) {
      const auto [name, isNew] = evidence.names.try_emplace(part.node);
      if (!isNew) continue;
      const NodeOwner& owner = ownerOf(part.node);
      name->second = owner.name;
      if (const auto times = watch.usualOf(part.node)) {
        evidence.usual.emplace(part.node, *times);
        usual[owner.computingProcess] += nanoseconds(times->compute);
      }
      if (owner.computingProcess == 0) continue;
      if (const auto facts = facts_.process(owner.computingProcess, from, to)) {
        evidence.processes.emplace(part.node, *facts);
      }
    }
  }
  const auto usualIn = [&](std::int32_t process, nanoseconds interval) {
    const double cycles = millisecondsOf(interval) / millisecondsOf(glitch.cycle.period);
    return std::chrono::duration_cast<nanoseconds>(usual[process] * cycles);
  };
  for (auto& [node, facts] : evidence.processes) {
    facts.usuallyRuns = usualIn(ownerOf(node).computingProcess, facts.interval);
  }
  evidence.machine = facts_.machine(from, to);
  std::vector<ProcessorHolder>& holders = evidence.machine.holders;
  for (ProcessorHolder& holder : holders) {
    if (usual.contains(holder.process)) holder.ran -= usualIn(holder.process, evidence.machine.interval);
  }
  std::stable_sort(holders.begin(), holders.end(),
                   [](const ProcessorHolder& a, const ProcessorHolder& b) { return a.ran > b.ran; });
  return evidence;
}

std::vector<NodeLink> GlitchReports::linksSince(nanoseconds time) const {
  std::vector<NodeLink> links = links_;
  for (const RemovedLink& removed : removedLinks_) {
    if (removed.at >= time) links.push_back(removed.link);
  }
  std::sort(links.begin(), links.end());
  links.erase(std::unique(links.begin(), links.end()), links.end());
  return links;
}

const NodeOwner& GlitchReports::ownerOf(std::uint32_t node) const {
  static const NodeOwner kNobody;
  const auto found = owners_.find(node);
  return found == owners_.end() ? kNobody : found->second;
}

std::string GlitchReports::processNameOf(const NodeOwner& owner) const {
  std::string name = facts_.nameOf(owner.process);
  return name.empty() ? owner.binary : name;
}

double GlitchReports::wallTimeOf(nanoseconds monotonic) const {
  const nanoseconds age = clock_.monotonic() - monotonic;
  if (age < nanoseconds(0) || age > kMaxAge) return clock_.now();
  return clock_.now() - std::chrono::duration<double>(age).count();
}

ValueMap GlitchReports::valuesOf(const GlitchEvidence& evidence, const Verdict& verdict,
                                 const std::string& id) const {
  const KeptCycle& cycle = evidence.cycles[evidence.first].cycle;
  ValueMap values{{kGlitchIDKey, id},
                  {kGlitchCauseKey, textOf(verdict.cause)},
                  {kGlitchFirstCauseKey, textOf(verdict.cause)},
                  {kGlitchConfidenceKey, verdict.confidence},
                  {kGlitchPeriodKey, millisecondsOf(cycle.period)},
                  {kGlitchQuantumKey, static_cast<std::int64_t>(cycle.frames)},
                  {kGlitchRateKey, static_cast<std::int64_t>(cycle.hertz)},
                  {kGlitchReasonKey, verdict.reason}};
  if (const NodeOwner& driver = ownerOf(evidence.driver); !driver.name.empty()) {
    values.set(kGlitchDeviceKey, driver.name);
  }
  if (verdict.culprit != 0) {
    const NodeOwner& owner = ownerOf(verdict.culprit);
    values.set(kGlitchCulpritNodeKey, owner.name);
    // Of a node without a processor in time, the culprit is who held it.
    const bool isHeld = verdict.holder != 0;
    const std::string process = isHeld ? verdict.holderName : processNameOf(owner);
    const std::string application = isHeld ? verdict.holderName : owner.application;
    const std::int32_t identifier = isHeld ? verdict.holder : owner.process;
    if (!application.empty()) values.set(kGlitchCulpritApplicationKey, application);
    if (!process.empty()) values.set(kGlitchCulpritProcessKey, process);
    if (identifier != 0) values.set(kGlitchCulpritPIDKey, identifier);
  }
  values.set(kGlitchCyclesKey,
             glitchCyclesText(evidence, [this](std::uint32_t node) { return processNameOf(ownerOf(node)); }));
  return values;
}

}  // namespace tonewerk
