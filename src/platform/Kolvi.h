// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

// One interval of a signpost, from its begin to its end.
struct KolviEvent {
  std::uint64_t timeDuration = 0;   // in the traced system's own unit of time
  std::optional<double> beginTime;  // in seconds since 1970; none when the trace does not say it
};

// One question of a probe list about a trace, with its answer. Probes form a tree.
struct KolviProbe {
  std::string name;
  std::vector<KolviProbe> children;
  bool isIntervalProbe = false;
  std::vector<KolviEvent> events;  // only of an interval probe; in the order in which they ended

  std::string description() const {
    return (isIntervalProbe ? "interval probe \"" : "probe \"") + name + "\"";
  }
};

// Converts the times of a trace.
class KolviTimeModel {
 public:
  virtual ~KolviTimeModel() = default;
  virtual double secondsFromSystemTimeDuration(std::uint64_t duration) const = 0;
};

// Gives access to a trace that was read. One thread.
class KolviModel {
 public:
  virtual ~KolviModel() = default;

  virtual const KolviTimeModel& timeModel() const = 0;

  // Makes one probe for each dictionary, in order. It skips elements that are not dictionaries or have no
  // name. A dictionary holds "name", "type" ("interval" makes an interval probe), "signpost" (whose intervals
  // to take; by default the name) and "children", an array of dictionaries.
  virtual std::vector<KolviProbe> makeProbes(const ValueArray& dictionaries) const = 0;
};

// Reads traces. Any thread.
class Kolvi {
 public:
  virtual ~Kolvi() = default;

  // Reads the trace. Returns null on failure, also when the trace has lost events; `problem` then says why.
  [[nodiscard]] virtual std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                              std::string& problem) = 0;
};

// Returns the probe dictionaries of a probe list: the elements of an array, or a single map. Returns none for
// any other root.
[[nodiscard]] std::optional<ValueArray> probeDictionariesOf(const Value& root);

// Returns the signposts whose intervals the dictionaries and their children need.
std::set<std::string> signpostsOf(const ValueArray& dictionaries);

// Implements KolviModel::makeProbes(). `eventsOf` returns a signpost's intervals.
std::vector<KolviProbe> makeKolviProbes(
    const ValueArray& dictionaries,
    const std::function<std::vector<KolviEvent>(const std::string& signpost)>& eventsOf);

}  // namespace tonewerk
