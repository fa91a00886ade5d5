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

// One request of a recording.
struct RecordedCall {
  std::size_t line = 0;  // in the file, from 1
  double at = 0.0;       // seconds from the beginning
  std::string method;
  // Parameters in which {"now": offset} stands for a time that only playing knows.
  Arguments parameters;

  // With every {"now": offset} replaced by `now` plus the offset, in seconds since 1970.
  Arguments parametersAt(double now) const;
};

// Requests to play to a daemon, as JSON Lines, in the order of their times:
//
//   {"at": 0, "call": "createReportingSession", "params": [7]}
//   {"at": 0.5, "call": "sendMessage", "params": [{"volume": 0.5, "twreporting_timestamp": {"now": 0}}, 4, 1,
//   [7]]}
//
// Empty lines are left out. A null is allowed where a request allows none.
class Recording {
 public:
  // None when a line is not one of the above, or no request that `interface` has; `problem` then says "line
  // 3: why".
  [[nodiscard]] static std::optional<Recording> read(std::istream& text, const RequestSet& interface,
                                                     const JsonService& json, std::string& problem);

  const std::vector<RecordedCall>& calls() const { return calls_; }

 private:
  std::vector<RecordedCall> calls_;
};

}  // namespace tonewerk
