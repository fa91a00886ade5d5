// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <vector>

#include "platform/RequestHandler.h"
#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

// The way back for one request, and what says that its body has run.
struct ServiceRequest {
  Reply reply;
  InFlightToken token;
};

// The daemon's request set, as a client's connection makes it, and the request to be no client but an
// onlooker. Called on the messaging thread; the answers come from the work queue. An answer is true, never
// false: unknown sessions are no errors.
class TWReportingServiceProtocol {
 public:
  using ReporterIDs = std::optional<std::vector<ReporterID>>;

  virtual ~TWReportingServiceProtocol() = default;

  virtual void createReportingSession(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void setServiceType(AudioServiceType serviceType, ReporterID reportingSession,
                              ServiceRequest request) = 0;
  // Answers with the service type's number, despite its name.
  virtual void getServiceNameForReporterID(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void setConfiguration(ValueMap configuration, ReporterID reporterID, ServiceRequest request) = 0;
  // Answered when the session stops.
  virtual void startReportingSessionForID(ReporterID reporterID, ServiceRequest request) = 0;
  // To the sessions named; without names to every started one.
  virtual void sendMessage(ValueMap message, AudioEventCategory category, AudioEventType type,
                           ReporterIDs reporterIDs, ServiceRequest request) = 0;
  virtual void stopReportingSessionForID(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void destroyReportingSession(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void reporterIDValid(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void getAllReporters(ServiceRequest request) = 0;
  // Ends the process. Never answered.
  virtual void killService() = 0;
  // The connection only looks on: it makes and changes nothing, and how long it lasted is not reported.
  virtual void observe(ServiceRequest request) = 0;
};

}  // namespace tonewerk
