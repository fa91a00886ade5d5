// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/ChromeTrace.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "values/CompactJson.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr double kMicrosecondsPerSecond = 1e6;
constexpr std::int64_t kProcess = 1;
constexpr std::int64_t kGraph = 2;
constexpr std::int64_t kSignposts = 3;
constexpr std::int64_t kCycles = 1;  // the first thread of the graph

enum Thread : std::int64_t {
  kSession = 1,
  kPlaying,
  kRecording,
  kGroupSession,
  kOutputDevice,
  kInputDevice,
  kIssues,
  kGlitches,
};

struct NamedThread {
  Thread thread;
  std::string_view name;
};
constexpr NamedThread kThreads[] = {{kSession, "session"},
                                    {kPlaying, "playing"},
                                    {kRecording, "recording"},
                                    {kGroupSession, "group session"},
                                    {kOutputDevice, "output device"},
                                    {kInputDevice, "input device"},
                                    {kIssues, "issues"},
                                    {kGlitches, "glitches"}};

Thread threadOf(const SessionRecords::Stretch& stretch) {
  if (stretch.category == "Input") return kRecording;
  return stretch.category == "Gather" ? kGroupSession : kPlaying;
}

class TraceWriter {
 public:
  using Cycles = std::map<std::int64_t, std::vector<GlitchCycle>>;

  TraceWriter(const StoredSession& session, const SessionRecords& records, const Cycles& cycles,
              const std::vector<SignpostInterval>& signposts)
      : session_(session), records_(records), cycles_(cycles), signposts_(signposts) {
    begin_ = session.startedAt;
    end_ = session.endedAt.value_or(begin_);
    for (const SessionRecords::Stretch& stretch : records.stretches) {
      if (!stretch.from || !stretch.until) continue;
      begin_ = std::min(begin_, *stretch.from);
      if (!session.endedAt) end_ = std::max(end_, *stretch.until);
    }
    for (const SessionRecords::Issue& issue : records.issues) {
      begin_ = std::min(begin_, issue.at);
      if (!session.endedAt) end_ = std::max(end_, issue.at);
      if (!issue.verdict) continue;
      begin_ = std::min(begin_, issue.verdict->at);
      for (const GlitchCycle& cycle : cyclesOf(issue)) begin_ = std::min(begin_, beginOf(issue, cycle));
    }
  }

  std::string text() {
    addSession();
    for (const SessionRecords::Stretch& stretch : records_.stretches) {
      if (stretch.from && stretch.until) addStretch(stretch);
    }
    addDevices(kOutputDevice);
    addDevices(kInputDevice);
    addVolume();
    for (const SessionRecords::Issue& issue : records_.issues) addIssue(issue);
    addGlitches();
    for (const SignpostInterval& signpost : signposts_) addSignpost(signpost);
    return written();
  }

 private:
  struct Event {
    std::int64_t at = 0;
    std::int64_t duration = 0;
    ValueMap json;
  };

  std::int64_t timeOf(double seconds) const {
    return std::llround((seconds - begin_) * kMicrosecondsPerSecond);
  }

  void add(ValueMap json, std::string_view phase, std::int64_t at, std::int64_t thread, ValueMap arguments,
           std::int64_t process = kProcess) {
    json.set("ph", phase);
    json.set("ts", at);
    json.set("pid", process);
    json.set("tid", thread);
    if (!arguments.empty()) json.set("args", std::move(arguments));
    events_.push_back({at, json.integer("dur"), std::move(json)});
  }

  void addSlice(const std::string& name, Thread thread, double from, double until, ValueMap arguments) {
    const std::int64_t at = timeOf(from);
    const std::int64_t duration = std::max<std::int64_t>(0, timeOf(until) - at);
    add({{"name", name}, {"cat", "session"}, {"dur", duration}}, "X", at, thread, std::move(arguments));
  }

  void addSession() {
    ValueMap facts{{"session", session_.id}, {"reporter", session_.reporterID}, {"user", session_.user}};
    if (session_.ending) facts.set("ending", *session_.ending);
    if (session_.messages) facts.set("messages", *session_.messages);
    if (session_.redundantMessages) facts.set("redundant_messages", *session_.redundantMessages);
    addSlice(session_.service.value_or("session"), kSession, session_.startedAt, end_, std::move(facts));
  }

  void addStretch(const SessionRecords::Stretch& stretch) {
    ValueMap facts{{"event", stretch.event}, {"seconds", stretch.seconds}};
    if (stretch.device) facts.set("device", *stretch.device);
    if (stretch.volume) facts.set("volume", *stretch.volume);
    addSlice(stretch.category, threadOf(stretch), *stretch.from, *stretch.until, std::move(facts));
  }

  // One slice for stretches on the same device that follow one another without a pause.
  void addDevices(Thread thread) {
    struct Use {
      std::string device;
      double from;
      double until;
    };
    std::optional<Use> use;
    const auto end = [&] {
      if (use) addSlice(use->device, thread, use->from, use->until, {});
      use.reset();
    };
    for (const SessionRecords::Stretch& stretch : records_.stretches) {
      const Thread wanted = thread == kOutputDevice ? kPlaying : kRecording;
      if (threadOf(stretch) != wanted || !stretch.device || !stretch.from || !stretch.until) continue;
      const bool goesOn =
          use && use->device == *stretch.device && timeOf(use->until) == timeOf(*stretch.from);
      if (!goesOn) {
        end();
        use = {*stretch.device, *stretch.from, *stretch.until};
      }
      use->until = *stretch.until;
    }
    end();
  }

  void addVolume() {
    std::optional<std::int64_t> silentFrom;
    const auto count = [this](std::int64_t at, double volume) {
      add({{"name", "volume"}, {"cat", "session"}}, "C", at, kPlaying, {{"volume", volume}});
    };
    for (const SessionRecords::Stretch& stretch : records_.stretches) {
      if (!stretch.volume || !stretch.from || !stretch.until) continue;
      const std::int64_t from = timeOf(*stretch.from);
      if (silentFrom && *silentFrom != from) count(*silentFrom, 0.0);
      count(from, *stretch.volume);
      silentFrom = timeOf(*stretch.until);
    }
    if (silentFrom) count(*silentFrom, 0.0);
  }

  void addIssue(const SessionRecords::Issue& issue) {
    ValueMap facts{{"event", issue.event}};
    if (issue.node) facts.set("node", *issue.node);
    if (issue.seconds) facts.set("silent_seconds", *issue.seconds);
    if (issue.frames) facts.set("buffer_frames", *issue.frames);
    add({{"name", issue.kind}, {"cat", "issue"}, {"s", "t"}}, "i", timeOf(issue.at), kIssues,
        std::move(facts));
  }

  const std::vector<GlitchCycle>& cyclesOf(const SessionRecords::Issue& issue) const {
    static const std::vector<GlitchCycle> none;
    const auto found = cycles_.find(issue.event);
    return found == cycles_.end() ? none : found->second;
  }

  static double beginOf(const SessionRecords::Issue& issue, const GlitchCycle& cycle) {
    return issue.verdict->at + cycle.begin / kMicrosecondsPerSecond;
  }

  void addGlitches() {
    std::vector<const SessionRecords::Issue*> glitches;
    for (const SessionRecords::Issue& issue : records_.issues) {
      if (issue.verdict) glitches.push_back(&issue);
    }
    std::stable_sort(glitches.begin(), glitches.end(),
                     [](const auto* a, const auto* b) { return a->verdict->at < b->verdict->at; });
    std::map<std::string, double> drawnUntil;  // by device: glitches in a row have cycles in common
    for (const SessionRecords::Issue* glitch : glitches) {
      addGlitch(*glitch);
      double& until =
          drawnUntil.try_emplace(glitch->verdict->device.value_or(""), begin_ - 1.0).first->second;
      for (const GlitchCycle& cycle : cyclesOf(*glitch)) {
        const double begin = beginOf(*glitch, cycle);
        const double period = cycle.period / kMicrosecondsPerSecond;
        if (begin + period / 2 < until) continue;
        addCycle(*glitch, cycle, begin);
        until = begin + period;
      }
    }
  }

  void addGlitch(const SessionRecords::Issue& issue) {
    const GlitchVerdict& verdict = *issue.verdict;
    ValueMap facts{{"event", issue.event}, {"culprit", culpritOf(verdict)}};
    if (verdict.id) facts.set("glitch_id", *verdict.id);
    if (verdict.cause) facts.set("cause", *verdict.cause);
    if (verdict.chain) facts.set("chain", *verdict.chain);
    if (verdict.overMs) facts.set("over_ms", *verdict.overMs);
    if (verdict.lostMs) facts.set("lost_ms", *verdict.lostMs);
    if (verdict.reason) facts.set("reason", *verdict.reason);
    add({{"name", "glitch: " + verdict.causeText()}, {"cat", "glitch"}, {"s", "t"}}, "i", timeOf(verdict.at),
        kGlitches, std::move(facts));
  }

  void addCycle(const SessionRecords::Issue& glitch, const GlitchCycle& cycle, double begin) {
    const auto slice = [&](const std::string& name, std::int64_t thread, double from, double until,
                           ValueMap facts) {
      // Who is late is so in the next cycle, too. Viewers cannot draw slices of one thread that overlap.
      std::int64_t& busyUntil = busyUntil_.try_emplace(thread, 0).first->second;
      const std::int64_t at = std::max(busyUntil, timeOf(begin + from / kMicrosecondsPerSecond));
      const std::int64_t end = timeOf(begin + until / kMicrosecondsPerSecond);
      if (end <= at) return;
      busyUntil = end;
      add({{"name", name}, {"cat", "graph"}, {"dur", end - at}}, "X", at, thread, std::move(facts), kGraph);
    };
    ValueMap facts{{"period_us", cycle.period}};
    if (glitch.verdict->device) facts.set("device", *glitch.verdict->device);
    slice(cycle.isOfGlitch() ? "the glitch's cycle" : "cycle", kCycles, 0.0, cycle.period, std::move(facts));
    for (const GlitchCycle::Node& node : cycle.nodes) {
      const std::int64_t thread = nodeThread(node);
      // A node that does not answer is shown until the deadline, or for a moment after it.
      const double unanswered = std::max(cycle.period, node.awake.value_or(node.signal));
      const double awake = node.awake.value_or(node.finish ? node.signal : unanswered);
      if (awake > node.signal) slice("waits", thread, node.signal, awake, {});
      if (!node.awake && !node.finish) continue;
      const double end = node.finish.value_or(unanswered);
      slice(node.finish ? "runs" : "runs, no answer", thread, awake, end, {});
    }
  }

  // A pair of events with a number of its own.
  void addSignpost(const SignpostInterval& signpost) {
    ++signpostNumber_;
    constexpr double kMsPerSecond = 1000.0;
    const std::int64_t begin = timeOf(signpost.begin);
    const std::int64_t end = timeOf(signpost.begin + signpost.milliseconds / kMsPerSecond);
    const ValueMap common{{"name", signpost.name}, {"cat", "signpost"}, {"id", signpostNumber_}};
    add(common, "b", begin, kSignposts, {{"ms", signpost.milliseconds}}, kSignposts);
    add(common, "e", end, kSignposts, {}, kSignposts);
  }

  std::int64_t nodeThread(const GlitchCycle::Node& node) {
    const std::string name = node.process.empty() ? node.name : node.name + " (" + node.process + ")";
    const auto next = kCycles + 1 + static_cast<std::int64_t>(nodeThreads_.size());
    return nodeThreads_.try_emplace(name, next).first->second;
  }

  void appendName(std::string& text, const char* what, std::int64_t thread, const std::string& name,
                  std::int64_t process = kProcess) const {
    appendCompactJson(text, ValueMap{{"name", what},
                                     {"ph", "M"},
                                     {"pid", process},
                                     {"tid", thread},
                                     {"ts", 0},
                                     {"args", ValueMap{{"name", name}}}});
    text += ",\n";
  }

  // In the order of the times; of slices that begin together the longest first, which holds the others.
  std::string written() {
    std::stable_sort(events_.begin(), events_.end(), [](const Event& a, const Event& b) {
      return a.at != b.at ? a.at < b.at : a.duration > b.duration;
    });
    std::string text = "{\"displayTimeUnit\":\"ms\",\"otherData\":";
    appendCompactJson(text, ValueMap{{"session", session_.id},
                                     {"zero", tonewerk::textOf(Date{begin_})},
                                     {"zero_seconds_since_1970", begin_}});
    text += ",\"traceEvents\":[\n";
    appendName(text, "process_name", 0,
               "session " + std::to_string(session_.id) + ": " +
                   session_.application.value_or("unknown application"));
    for (const NamedThread& thread : kThreads) {
      const bool isUsed = std::any_of(events_.begin(), events_.end(), [&](const Event& event) {
        return event.json.integer("pid") == kProcess && event.json.integer("tid") == thread.thread;
      });
      if (isUsed) appendName(text, "thread_name", thread.thread, std::string(thread.name));
    }
    if (!nodeThreads_.empty()) {
      appendName(text, "process_name", 0, "audio graph around glitches", kGraph);
      appendName(text, "thread_name", kCycles, "cycles", kGraph);
    }
    for (const auto& [name, thread] : nodeThreads_) appendName(text, "thread_name", thread, name, kGraph);
    if (!signposts_.empty()) {
      appendName(text, "process_name", 0, "signposts", kSignposts);
      appendName(text, "thread_name", kSignposts, "signposts", kSignposts);
    }
    for (std::size_t at = 0; at < events_.size(); ++at) {
      appendCompactJson(text, events_[at].json);
      text += at + 1 < events_.size() ? ",\n" : "\n";
    }
    return text + "]}\n";
  }

  const StoredSession& session_;
  const SessionRecords& records_;
  const Cycles& cycles_;
  const std::vector<SignpostInterval>& signposts_;
  std::int64_t signpostNumber_ = 0;
  std::map<std::string, std::int64_t> nodeThreads_;
  std::map<std::int64_t, std::int64_t> busyUntil_;  // by thread of the graph, in microseconds
  double begin_ = 0.0;
  double end_ = 0.0;
  std::vector<Event> events_;
};

}  // namespace

std::string chromeTrace(const StoredSession& session, const SessionRecords& records,
                        const std::map<std::int64_t, std::vector<GlitchCycle>>& cycles,
                        const std::vector<SignpostInterval>& signposts) {
  return TraceWriter(session, records, cycles, signposts).text();
}

}  // namespace tonewerk
