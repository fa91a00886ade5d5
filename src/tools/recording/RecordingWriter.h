// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <iosfwd>
#include <optional>
#include <set>
#include <string>

#include "protocol/RequestSet.h"

namespace tonewerk {

class JsonService;

// A client of a sequence of requests.
struct RecordedClient {
  std::int64_t number = 0;   // differs between the clients of a recording; from 0
  std::uint32_t user = 0;    // kNoUser when it is not known
  std::string process = {};  // empty when it is not known
};

// Writes requests as a recording. A replay without a daemon gives each the time at which it came.
//
//   RecordingWriter writer(file, json, {{"user", 995}});
//   writer.call(1763633880.25, {2, 1001, "player"}, "createReportingSession", {7});
//   writer.disconnect(1763633884.0, 2);
//   if (!writer.finish()) ...
class RecordingWriter {
 public:
  // `out` and `json` outlive it. `device`: what the first line says of the device, besides the time.
  RecordingWriter(std::ostream& out, const JsonService& json, ValueMap device);

  // `time` is in seconds since 1970. In a recording no time is before that of the line before, so when the
  // clock went back, a request gets the time of that line. A client connects with its first request, or with
  // its first one after disconnect(). The daemon has accepted the request, so its texts are UTF-8.
  void call(double time, const RecordedClient& client, const std::string& method, const Arguments& arguments);
  // Does nothing for a client that is not connected.
  void disconnect(double time, std::int64_t client);
  // The daemon has ended, and so have all connections and sessions. Does nothing before the first request.
  void restart(double time);
  // The recording goes on at least until then, so that a replay does what is due by its clock. Does nothing
  // before the first request, or when the recording goes on longer already.
  void reach(double time);
  // Whether everything has been written.
  [[nodiscard]] bool finish();

 private:
  // "at" of a line.
  double placeOf(double time);
  void connect(double at, const RecordedClient& client);
  void write(const ValueMap& line, const std::string& parameters = {});

  std::ostream& out_;
  const JsonService& json_;
  ValueMap device_;
  std::optional<double> startsAt_;  // none before the first line
  double last_ = 0.0;               // "at" of the last line
  std::set<std::int64_t> connected_;
};

}  // namespace tonewerk
