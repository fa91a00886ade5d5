// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "protocol/RequestSet.h"

namespace tonewerk {

class JsonService;

// One line of a recording.
struct RecordedStep {
  enum class Kind {
    kCall,        // a request
    kConnect,     // a client connects
    kDisconnect,  // its connection ends
    kDevice,      // what the device was like from then on
    kRestart,     // the daemon ends, which ends all connections and sessions, and another one begins
  };

  // The client of a line without "client".
  static constexpr std::int64_t kFirstClient = 1;

  std::size_t line = 0;  // in the file, from 1
  double at = 0.0;       // seconds from the beginning
  Kind kind = Kind::kCall;
  std::int64_t client = kFirstClient;
  std::string method;  // of a call
  // Those of a call, as they are recorded (RecordedValues.h).
  Arguments parameters;
  // Of a client that connects, or of the device; see docs/twctl.md.
  ValueMap properties;

  // The parameters when they are played at `now`, in seconds since 1970.
  Arguments parametersAt(double now) const;
};

// Reads requests to play to a daemon. The text is JSON Lines, in the order of the times:
//
//   {"at": 0, "call": "createReportingSession", "params": [7]}
//   {"at": 0.5, "call": "sendMessage", "params": [{"volume": 0.5, "twreporting_timestamp": {"now": 0}}, 4, 1,
//   [7]]}
//
// Empty lines are ignored. null is allowed where the request allows a parameter to be left out. A recording
// of several clients numbers them, and says who they are and when they go; one of a device says what the
// device was like:
//
//   {"device": {"starts_at": 1763633880, "facts": {"InternalBuild": true}}}
//   {"at": 0, "client": 2, "connect": {"user": 1001, "process": "player"}}
//   {"at": 0, "client": 2, "call": "createReportingSession", "params": [7]}
//   {"at": 4, "client": 2, "disconnect": true}
//   {"at": 9, "restart": true}
class Recording {
 public:
  // None when a line has another form, or is not a request of `interface`; `problem` is then "line 3: why".
  [[nodiscard]] static std::optional<Recording> read(std::istream& text, const RequestSet& interface,
                                                     const JsonService& json, std::string& problem);

  const std::vector<RecordedStep>& steps() const { return steps_; }
  // How many of the steps are requests.
  std::size_t requests() const { return requests_; }

 private:
  [[nodiscard]] std::string add(RecordedStep step, const RequestSet& interface);

  std::vector<RecordedStep> steps_;
  std::size_t requests_ = 0;
  std::map<std::int64_t, bool> isConnected_;  // by client
  double startsAt_ = 0.0;                     // in seconds since 1970, if the first line says it
};

}  // namespace tonewerk
