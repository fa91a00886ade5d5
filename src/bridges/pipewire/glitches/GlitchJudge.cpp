// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/glitches/GlitchJudge.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <set>

namespace tonewerk {

namespace {

using std::chrono::nanoseconds;

// A node that has not answered for so long hangs, unless the kernel says that it works.
constexpr nanoseconds kHanging = std::chrono::milliseconds(500);
// One that did not even wake for so long hangs, unless the kernel says that it waited for a processor.
constexpr nanoseconds kNotWaking = std::chrono::milliseconds(100);
// The graph may need so long for a change that it has told of, and so long to tell of one.
constexpr nanoseconds kChangeTakes = std::chrono::milliseconds(150);
// The clocks' readings may differ by less when the system did not sleep.
constexpr nanoseconds kShortestSleep = std::chrono::milliseconds(10);
// A node is signalled so shortly after the one before it has finished.
constexpr std::int32_t kSignalTakes = 200'000;  // nanoseconds
// A wait this much longer than usual means that the node was still busy with its cycle before.
constexpr std::int32_t kStillBusy = 500'000;

__attribute__((format(printf, 1, 2))) std::string formatted(const char* format, ...) {
  char text[512];
  va_list arguments;
  va_start(arguments, format);
  std::vsnprintf(text, sizeof text, format, arguments);
  va_end(arguments);
  return text;
}

double millisecondsOf(nanoseconds time) { return std::chrono::duration<double, std::milli>(time).count(); }

// What one node did of its own: the time for which it kept the chain waiting.
struct Delay {
  std::uint32_t node = 0;
  bool isWaking = false;  // it woke late, rather than computed long
  nanoseconds from{0};    // monotonic time of its signal, or of its waking
  nanoseconds to{0};      // of its waking, or of its end
  nanoseconds usual{0};
  bool isOpen = false;     // it has not come to an end
  nanoseconds handing{0};  // of all this: from its finish until it had signalled the next

  nanoseconds length() const { return to - from; }
  nanoseconds excess() const { return std::max(length() - usual, nanoseconds(0)); }
};

class Judge {
 public:
  explicit Judge(const GlitchEvidence& evidence) : evidence_(evidence) {}

  Verdict judge() {
    if (evidence_.machine.slept >= kShortestSleep) return slept();
    if (evidence_.cycles.empty() || !glitch().cycle.isUnfinished) return withoutLateNode();
    findDelays();
    if (delays_.empty()) return withoutRoot();
    const Delay& worst =
        *std::max_element(delays_.begin(), delays_.end(),
                          [&](const Delay& a, const Delay& b) { return weightOf(a) < weightOf(b); });
    Verdict verdict = judge(worst);
    lowerForUnknownThread(worst, verdict);
    lowerForOthers(worst, verdict);
    return verdict;
  }

 private:
  const GlitchCycle& glitch() const { return evidence_.cycles[evidence_.first]; }
  const char* nameOf(std::uint32_t node) const {
    const auto found = evidence_.names.find(node);
    return found == evidence_.names.end() || found->second.empty() ? "a node" : found->second.c_str();
  }
  const ProcessFacts* factsOf(std::uint32_t node) const {
    const auto found = evidence_.processes.find(node);
    return found == evidence_.processes.end() ? nullptr : &found->second;
  }
  UsualTimes usualOf(std::uint32_t node) const {
    const auto found = evidence_.usual.find(node);
    return found == evidence_.usual.end() ? UsualTimes() : found->second;
  }
  bool isNew(std::uint32_t node) const { return !evidence_.usual.contains(node); }
  static const KeptNode* find(const GlitchCycle& cycle, std::uint32_t node) {
    const auto found = std::find_if(cycle.nodes.begin(), cycle.nodes.end(),
                                    [&](const KeptNode& part) { return part.node == node; });
    return found == cycle.nodes.end() ? nullptr : &*found;
  }

  Verdict slept() const {
    return {.cause = GlitchCause::kSystemSlept,
            .confidence = 0.95,
            .reason = formatted("The system was suspended for %.3f s.",
                                std::chrono::duration<double>(evidence_.machine.slept).count())};
  }

  Verdict withoutLateNode() const {
    if (evidence_.deviceXruns == 0) {
      return {.confidence = 0.2,
              .reason = "PipeWire counted an xrun, but no node was late in a cycle that is known."};
    }
    return {.cause = GlitchCause::kDevice,
            .confidence = 0.75,
            .reason = formatted("The driver counted %u xruns, although every node had finished in time.",
                                evidence_.deviceXruns)};
  }

  // No node was signalled and late: those that are unfinished have just come, or wait although all before
  // them have finished. Only a change of links, which takes a signal away, does that.
  Verdict withoutRoot() const { return changed(hasChanged(kChangeTakes) ? 0.9 : 0.6); }

  Verdict changed(double confidence) const {
    return {.cause = GlitchCause::kGraphChanged,
            .confidence = confidence,
            .reason = formatted("The graph changed %s, and the cycle was not complete after %.2f ms.",
                                changeText().c_str(), millisecondsOf(glitch().cycle.period))};
  }

  std::string changeText() const {
    if (evidence_.first > 0 && evidence_.cycles[evidence_.first - 1].cycle.frames != glitch().cycle.frames) {
      return formatted("from %u to %u frames in a cycle", evidence_.cycles[evidence_.first - 1].cycle.frames,
                       glitch().cycle.frames);
    }
    const auto change = changeWithin(kChangeTakes);
    if (!change) return "its nodes";
    const double before = millisecondsOf(glitch().cycle.begin - *change);
    return before >= 0 ? formatted("its nodes or links %.0f ms before", before) : "its nodes or links";
  }

  // The change next to the glitch, until so long after its end.
  std::optional<nanoseconds> changeWithin(nanoseconds after) const {
    std::optional<nanoseconds> found;
    const nanoseconds begin = glitch().cycle.begin;
    for (const nanoseconds change : evidence_.shapeChanges) {
      if (change < begin - kChangeTakes) continue;
      if (change > evidence_.cycles[evidence_.last].cycle.end() + after) continue;
      if (!found || change <= begin) found = change;
    }
    return found;
  }

  bool hasChanged(nanoseconds after) const {
    const GlitchCycle& late = glitch();
    if (changeWithin(after)) return true;
    if (evidence_.first == 0) return false;
    const GlitchCycle& before = evidence_.cycles[evidence_.first - 1];
    const auto isHere = [&](const KeptNode& part) { return find(late, part.node) != nullptr; };
    return before.cycle.frames != late.cycle.frames || before.nodes.size() != late.nodes.size() ||
           !std::all_of(before.nodes.begin(), before.nodes.end(), isHere);
  }

  void findDelays() {
    for (const KeptNode& part : glitch().nodes) {
      const bool isRoot = part.stage == NodeTimes::kSignalled || part.stage == NodeTimes::kAwake;
      // A node that is being started is not late, but others may wait for it.
      if (isRoot && !isNew(part.node)) followBack(part);
    }
  }

  // Adds the delays of an unfinished node, and of those that it had to wait for.
  void followBack(const KeptNode& root) {
    add(delayOf(root));
    // One that is awake may have woken so late that it could not finish.
    if (root.stage == NodeTimes::kAwake) addWaking(root);
    std::set<std::uint32_t> seen{root.node};
    const KeptNode* part = before(root);
    const KeptNode* next = &root;
    while (part != nullptr && seen.insert(part->node).second) {
      const nanoseconds begin = glitch().cycle.begin;
      const UsualTimes usual = usualOf(part->node);
      addWaking(*part);
      if (part->awake != KeptNode::kNever && part->finish != KeptNode::kNever) {
        // It notes its finish before it signals the next, and can lose its processor in between.
        const std::int32_t end = std::max(part->finish, next->signal);
        add({part->node, false, begin + nanoseconds(part->awake), begin + nanoseconds(end),
             nanoseconds(usual.compute), false, nanoseconds(end - part->finish)});
      }
      next = part;
      part = before(*part);
    }
  }

  void addWaking(const KeptNode& part) {
    if (part.awake == KeptNode::kNever || part.signal == KeptNode::kNever) return;
    const nanoseconds begin = glitch().cycle.begin;
    add({part.node, true, begin + nanoseconds(part.signal), begin + nanoseconds(part.awake),
         nanoseconds(usualOf(part.node).wait)});
  }

  void add(const Delay& delay) {
    const auto isSame = [&](const Delay& other) {
      return other.node == delay.node && other.isWaking == delay.isWaking;
    };
    if (std::none_of(delays_.begin(), delays_.end(), isSame)) delays_.push_back(delay);
  }

  // The node that signalled this one: of those linked to it, the one that finished last.
  const KeptNode* before(const KeptNode& part) const {
    if (part.signal == KeptNode::kNever) return nullptr;
    const KeptNode* last = nullptr;
    bool isLinked = false;
    for (const KeptNode& other : glitch().nodes) {
      if (other.finish == KeptNode::kNever || other.finish > part.signal + kSignalTakes) continue;
      if (other.node == part.node) continue;
      const bool leads =
          std::binary_search(evidence_.links.begin(), evidence_.links.end(), NodeLink{other.node, part.node});
      // Without a link, the times tell: some nodes of one process are connected inside it.
      const bool isShortlyBefore =
          part.signal - other.finish < kSignalTakes && part.signal > 2 * kSignalTakes;
      if (!leads && (isLinked || !isShortlyBefore)) continue;
      if (last == nullptr || (leads && !isLinked) || other.finish > last->finish) last = &other;
      isLinked = isLinked || leads;
    }
    return last;
  }

  // How long an unfinished node took, as the cycles after it show.
  Delay delayOf(const KeptNode& root) const {
    const nanoseconds begin = glitch().cycle.begin;
    const UsualTimes usual = usualOf(root.node);
    const bool isWaking = root.stage == NodeTimes::kSignalled;
    Delay delay{root.node, isWaking, begin, begin, nanoseconds(isWaking ? usual.wait : usual.compute), false};
    const std::int32_t from = isWaking ? root.signal : root.awake;
    if (from != KeptNode::kNever) delay.from += nanoseconds(from);
    delay.to = std::max(glitch().cycle.end(), delay.from);
    for (std::size_t i = evidence_.first + 1; i < evidence_.cycles.size(); ++i) {
      const GlitchCycle& later = evidence_.cycles[i];
      const KeptNode* part = find(later, root.node);
      if (part == nullptr) break;  // it has left
      // It was still busy with the cycle before, and finished both at once.
      if (part->awake == KeptNode::kNever && part->finish != KeptNode::kNever) {
        delay.to = std::max(later.cycle.begin + nanoseconds(part->finish), delay.to);
        return delay;
      }
      if (part->awake == KeptNode::kNever) {
        delay.to = std::max(later.cycle.end(), delay.to);
        continue;
      }
      const bool wasBusy =
          part->signal != KeptNode::kNever && part->awake - part->signal > usual.wait + kStillBusy;
      // One that was ready when the cycle began had come to its end at some time before.
      if (isWaking || wasBusy) delay.to = std::max(later.cycle.begin + nanoseconds(part->awake), delay.to);
      return delay;
    }
    delay.isOpen = true;
    return delay;
  }

  // Whether its thread ran for at least half of the time that the node took beyond the usual. A sample is
  // about many cycles, in which it ran as usual, too.
  static bool hasRun(const Delay& delay, const ProcessFacts& facts) {
    return (facts.ran - facts.usuallyRuns) * 2 >= delay.excess();
  }

  // How much a delay counts. Of two that are about as long, the node that had a processor kept the other from
  // it.
  double weightOf(const Delay& delay) const {
    const double excess = millisecondsOf(delay.excess());
    const ProcessFacts* facts = factsOf(delay.node);
    const bool ran = !delay.isWaking && facts != nullptr && hasRun(delay, *facts);
    return ran ? excess * 1.5 : excess;
  }

  Verdict judge(const Delay& delay) const {
    Verdict verdict = delay.isWaking ? judgeWaking(delay) : judgeComputing(delay);
    verdict.culprit = delay.node;
    const nanoseconds over = verdict.cause == GlitchCause::kStuck ? delay.length() : overOf(delay);
    verdict.overMilliseconds = millisecondsOf(over);
    const bool isShort = delay.length() < 3 * glitch().cycle.period;
    // One that stayed within the period has spoiled nothing.
    const bool isWithin = delay.length() < glitch().cycle.period * 9 / 10;
    if (hasChanged(nanoseconds(0)) && (isWithin || (isShort && verdict.confidence < 0.9))) {
      Verdict change = changed(isWithin ? 0.85 : 0.7);
      change.overMilliseconds = verdict.overMilliseconds;
      return change;
    }
    return verdict;
  }

  // A node in the middle of the chain took its excess from the time of those behind it.
  nanoseconds overOf(const Delay& delay) const {
    const nanoseconds beyond = delay.to - glitch().cycle.end();
    return beyond > nanoseconds(0) ? beyond : delay.excess();
  }

  Verdict judgeWaking(const Delay& delay) const {
    const ProcessFacts* facts = factsOf(delay.node);
    const nanoseconds length = delay.length();
    const std::string figures =
        formatted("%s was signalled, but did not wake for %.2f ms (usually %.3f ms; the period is %.2f ms)",
                  nameOf(delay.node), millisecondsOf(length), millisecondsOf(delay.usual),
                  millisecondsOf(glitch().cycle.period));
    if (facts == nullptr) {
      const bool hangs = delay.isOpen || length >= std::max(kNotWaking, 3 * glitch().cycle.period);
      return {.cause = hangs ? GlitchCause::kStuck : GlitchCause::kNotScheduled,
              .confidence = 0.6,
              .reason = figures + "."};
    }
    if (facts->isStopped) {
      return {
          .cause = GlitchCause::kStuck, .confidence = 0.95, .reason = figures + "; its process was stopped."};
    }
    if (facts->waited * 2 >= length) return notScheduled(delay, *facts, figures);
    if (hasRun(delay, *facts)) {
      return {.cause = GlitchCause::kLate,
              .confidence = 0.7,
              .reason = figures + formatted("; meanwhile it ran for %.2f ms with something else.",
                                            millisecondsOf(facts->ran))};
    }
    if (facts->isRunnable && delay.isOpen) return notScheduled(delay, *facts, figures);
    return {.cause = GlitchCause::kStuck,
            .confidence = 0.85,
            .reason = figures + formatted("; it neither ran (%.2f ms) nor waited for a processor (%.2f ms).",
                                          millisecondsOf(facts->ran), millisecondsOf(facts->waited))};
  }

  Verdict judgeComputing(const Delay& delay) const {
    const ProcessFacts* facts = factsOf(delay.node);
    const nanoseconds length = delay.length();
    const std::string figures =
        formatted("%s took %s%.2f ms for its part (usually %.3f ms; the period is %.2f ms)",
                  nameOf(delay.node), delay.isOpen ? "more than " : "", millisecondsOf(length),
                  millisecondsOf(delay.usual), millisecondsOf(glitch().cycle.period));
    if (delay.handing * 2 >= length && (facts == nullptr || !facts->isStopped))
      return handing(delay, figures);
    const bool hangs = delay.isOpen && length >= kHanging;
    if (facts == nullptr) {
      return {.cause = hangs ? GlitchCause::kStuck : GlitchCause::kLate,
              .confidence = 0.7,
              .reason = figures + "."};
    }
    if (facts->isStopped) {
      return {
          .cause = GlitchCause::kStuck, .confidence = 0.9, .reason = figures + "; its process was stopped."};
    }
    if (facts->waited * 2 >= length && facts->waited > facts->ran)
      return notScheduled(delay, *facts, figures);
    if (hasRun(delay, *facts)) {
      return {.cause = GlitchCause::kLate,
              .confidence = 0.95,
              .reason =
                  figures + formatted("; its thread ran for %.2f ms around it.", millisecondsOf(facts->ran))};
    }
    if (facts->majorFaults > 0 || facts->isWaitingForDevice || evidence_.machine.ioStall * 3 >= length) {
      return {.cause = GlitchCause::kLate,
              .confidence = 0.9,
              .reason = figures +
                        formatted("; it waited for storage (%llu page faults; somebody waited for %.2f ms).",
                                  static_cast<unsigned long long>(facts->majorFaults),
                                  millisecondsOf(evidence_.machine.ioStall))};
    }
    return {.cause = hangs ? GlitchCause::kStuck : GlitchCause::kLate,
            .confidence = 0.85,
            .reason = figures + formatted("; it ran for %.2f ms and waited for something else for the rest.",
                                          millisecondsOf(facts->ran))};
  }

  // Between its finish and its signal to the next a node has nothing to wait for but a processor.
  Verdict handing(const Delay& delay, const std::string& figures) const {
    const std::string more =
        formatted("; it had finished %.2f ms before it signalled the next", millisecondsOf(delay.handing));
    const ProcessFacts* facts = factsOf(delay.node);
    if (facts != nullptr && facts->waited * 2 >= delay.handing)
      return notScheduled(delay, *facts, figures + more);
    return {.cause = GlitchCause::kNotScheduled,
            .confidence = 0.6,
            .reason = figures + more + ", so its thread had no processor."};
  }

  // Somebody else who kept a processor busy for at least half of the time that was lost.
  const ProcessorHolder* holderIn(const Delay& delay) const {
    const std::vector<ProcessorHolder>& holders = evidence_.machine.holders;
    if (holders.empty() || holders.front().ran * 2 < delay.excess()) return nullptr;
    return &holders.front();
  }

  Verdict notScheduled(const Delay& delay, const ProcessFacts& facts, const std::string& figures) const {
    Verdict verdict{.cause = GlitchCause::kNotScheduled, .confidence = 0.9};
    verdict.reason =
        figures + formatted("; it waited for a processor for %.2f ms", millisecondsOf(facts.waited));
    if (!facts.isRealTime) verdict.reason += ", without a real-time priority";
    if (const ProcessorHolder* holder = holderIn(delay); holder != nullptr && holder->process != 0) {
      verdict.holder = holder->process;
      verdict.holderName = holder->name;
      verdict.reason += formatted(", while %s ran for %.1f ms at real-time priority %d", holder->name.c_str(),
                                  millisecondsOf(holder->ran), holder->priority);
    }
    verdict.reason += ".";
    if (delay.isOpen) verdict.confidence = 0.8;
    return verdict;
  }

  // What any thread of the process did may be another's doing; that a process was stopped is of all of them.
  void lowerForUnknownThread(const Delay& worst, Verdict& verdict) const {
    const ProcessFacts* facts = factsOf(worst.node);
    const bool isOfNode = verdict.culprit != 0;
    if (!isOfNode || facts == nullptr || facts->isThreadKnown || facts->isStopped) return;
    verdict.confidence *= 0.8;
    verdict.reason += " (Its audio thread is not known: these are figures of all its threads.)";
  }

  // Somebody else was nearly as slow in this cycle.
  void lowerForOthers(const Delay& worst, Verdict& verdict) const {
    for (const Delay& other : delays_) {
      if (other.node != worst.node && weightOf(other) * 2 > weightOf(worst)) {
        verdict.confidence *= 0.7;
        return;
      }
    }
  }

  const GlitchEvidence& evidence_;
  std::vector<Delay> delays_;
};

}  // namespace

std::string_view textOf(GlitchCause cause) {
  switch (cause) {
    case GlitchCause::kLate:
      return "late";
    case GlitchCause::kNotScheduled:
      return "not scheduled";
    case GlitchCause::kStuck:
      return "stuck";
    case GlitchCause::kWaiting:
      return "waiting for another";
    case GlitchCause::kDevice:
      return "device";
    case GlitchCause::kGraphChanged:
      return "graph changed";
    case GlitchCause::kSystemSlept:
      return "system slept";
    case GlitchCause::kUnknown:
      break;
  }
  return "unknown";
}

Verdict judgeGlitch(const GlitchEvidence& evidence) { return Judge(evidence).judge(); }

std::vector<std::uint32_t> wayThrough(std::span<const NodeLink> links, std::uint32_t from, std::uint32_t to) {
  std::map<std::uint32_t, std::uint32_t> cameFrom{{from, from}};
  std::vector<std::uint32_t> edge{from};
  while (!edge.empty() && !cameFrom.contains(to)) {
    std::vector<std::uint32_t> next;
    for (const NodeLink& link : links) {
      if (std::find(edge.begin(), edge.end(), link.output) == edge.end()) continue;
      if (cameFrom.try_emplace(link.input, link.output).second) next.push_back(link.input);
    }
    edge = std::move(next);
  }
  std::vector<std::uint32_t> way;
  if (!cameFrom.contains(to)) return way;
  for (std::uint32_t node = to; node != from; node = cameFrom.at(node)) way.push_back(node);
  way.push_back(from);
  std::reverse(way.begin(), way.end());
  return way;
}

}  // namespace tonewerk
