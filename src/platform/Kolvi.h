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

// An interval of a signpost: from its begin to its end.
struct KolviEvent {
  std::uint64_t timeDuration = 0;  // in the traced system's own unit of time
};

// What a probe list asks of a trace, with the answer. Probes form a tree.
struct KolviProbe {
  std::string name;
  std::vector<KolviProbe> children;
  bool isIntervalProbe = false;
  std::vector<KolviEvent> events;  // an interval probe's, in the order in which they ended

  std::string description() const {
    return (isIntervalProbe ? "interval probe \"" : "probe \"") + name + "\"";
  }
};

// How a trace measures time.
class KolviTimeModel {
 public:
  virtual ~KolviTimeModel() = default;
  virtual double secondsFromSystemTimeDuration(std::uint64_t duration) const = 0;
};

// A trace that was read. One thread.
class KolviModel {
 public:
  virtual ~KolviModel() = default;

  virtual const KolviTimeModel& timeModel() const = 0;

  // One probe a dictionary, in order; what is no dictionary, or one without a name, gives none. A dictionary
  // holds "name", "type" ("interval" makes an interval probe), "signpost" (whose intervals; the name when it
  // is absent) and "children", an array of dictionaries.
  virtual std::vector<KolviProbe> makeProbes(const ValueArray& dictionaries) const = 0;
};

// The trace-model library. Any thread.
class Kolvi {
 public:
  virtual ~Kolvi() = default;

  // Reads the trace. Null when that fails, a trace with lost events included; `problem` then says why.
  [[nodiscard]] virtual std::unique_ptr<KolviModel> openModel(const std::string& traceLocation,
                                                              std::string& problem) = 0;
};

// The probe dictionaries that a probe list holds: an array's elements, or the one map that it is. None for
// any other root.
[[nodiscard]] std::optional<ValueArray> probeDictionariesOf(const Value& root);

// The signposts whose intervals the dictionaries and their children ask for.
std::set<std::string> signpostsOf(const ValueArray& dictionaries);

// What KolviModel::makeProbes() promises, over whatever knows a signpost's intervals.
std::vector<KolviProbe> makeKolviProbes(
    const ValueArray& dictionaries,
    const std::function<std::vector<KolviEvent>(const std::string& signpost)>& eventsOf);

}  // namespace tonewerk
