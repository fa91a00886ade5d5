// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>
#include <string>
#include <vector>

#include "protocol/RequestSet.h"

namespace tonewerk {

class JsonService;

// A request of a recording.
struct RecordedCall {
  std::size_t line = 0;  // in the file, from 1
  double at = 0.0;       // seconds from the beginning
  std::string method;
  // In these, {"now": offset} stands for a time relative to the time of playing.
  Arguments parameters;

  // The parameters with every {"now": offset} replaced by `now` plus the offset, in seconds since 1970.
  Arguments parametersAt(double now) const;
};

// Reads requests to play to a daemon. The text is JSON Lines, in the order of the times:
//
//   {"at": 0, "call": "createReportingSession", "params": [7]}
//   {"at": 0.5, "call": "sendMessage", "params": [{"volume": 0.5, "twreporting_timestamp": {"now": 0}}, 4, 1,
//   [7]]}
//
// Empty lines are ignored. null is allowed where the request allows a parameter to be left out.
class Recording {
 public:
  // None when a line has another form, or is not a request of `interface`; `problem` is then "line 3: why".
  [[nodiscard]] static std::optional<Recording> read(std::istream& text, const RequestSet& interface,
                                                     const JsonService& json, std::string& problem);

  const std::vector<RecordedCall>& calls() const { return calls_; }

 private:
  std::vector<RecordedCall> calls_;
};

}  // namespace tonewerk
