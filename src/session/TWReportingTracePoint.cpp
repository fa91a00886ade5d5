// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingTracePoint.h"

#include "platform/TracePoints.h"
#include "session/TWReportingContext.h"

namespace tonewerk {
namespace {

const char* requestName(TWReportingTracePoint point) {
  switch (point) {
    case TWReportingTracePoint::kRequestCreate:
      return "createReportingSession";
    case TWReportingTracePoint::kRequestStart:
      return "startReportingSessionForID";
    case TWReportingTracePoint::kRequestStop:
      return "stopReportingSessionForID";
    case TWReportingTracePoint::kRequestDestroy:
      return "destroyReportingSession";
    case TWReportingTracePoint::kRequestSend:
      return "sendMessage";
    default:
      return "request";
  }
}

TracePoints& tracePoints() { return TWReportingContext::current().platform().tracePoints; }

}  // namespace

void emitTracePoint(TWReportingTracePoint point) { tracePoints().emit(static_cast<std::uint32_t>(point)); }

TracedRequest::TracedRequest(TWReportingTracePoint point, std::int64_t identifier)
    : name_(requestName(point)), identifier_(identifier) {
  emitTracePoint(point);
  tracePoints().beginInterval(name_, identifier_);
}

TracedRequest::~TracedRequest() { tracePoints().endInterval(name_, identifier_); }

}  // namespace tonewerk
