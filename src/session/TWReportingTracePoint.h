// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// The daemon's trace points, with the codes that a tracer sees.
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

// Emits `point` through the platform.
void emitTracePoint(TWReportingTracePoint point);

// Traces the body of a request: emits its trace point, and marks an interval from here to the end of the
// scope. The interval has the request's name, so that performance traces can show it.
class TracedRequest {
 public:
  // `point` must be one of a request. `identifier` is the session's, or 0 without a session; it tells
  // intervals apart.
  explicit TracedRequest(TWReportingTracePoint point, std::int64_t identifier = 0);
  TracedRequest(const TracedRequest&) = delete;
  TracedRequest& operator=(const TracedRequest&) = delete;
  ~TracedRequest();

 private:
  const char* const name_;
  const std::int64_t identifier_;
};

}  // namespace tonewerk
