// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// The daemon's trace points: the codes that a tracer sees.
enum class TWReportingTracePoint : std::uint32_t {
  kRequestCreate = 0x21044814,
  kRequestStart = 0x21044818,
  kRequestStop = 0x2104481C,
  kRequestDestroy = 0x21044820,
  kRequestSend = 0x21044824,
  kSessionCreated = 0x21044828,
  kSessionStarted = 0x2104482C,
  kSessionEnding = 0x21044830,
  kSessionReleased = 0x21044834,
  kMessageReceived = 0x21044838,
};

// Emits it through the platform.
void emitTracePoint(TWReportingTracePoint point);

// A request's body: emits its point, and is an interval of the request's name from here to the end of the
// scope, in which performance traces can show it.
class TracedRequest {
 public:
  // `point` is a request's. `identifier` tells intervals apart: the session's, 0 for none.
  explicit TracedRequest(TWReportingTracePoint point, std::int64_t identifier = 0);
  TracedRequest(const TracedRequest&) = delete;
  TracedRequest& operator=(const TracedRequest&) = delete;
  ~TracedRequest();

 private:
  const char* const name_;
  const std::int64_t identifier_;
};

}  // namespace tonewerk
