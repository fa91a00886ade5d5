// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string_view>
#include <vector>

#include "platform/JournalPosition.h"
#include "platform/RequestHandler.h"
#include "protocol/AudioEvent.h"
#include "values/Value.h"

namespace tonewerk {

// Answers one request, and tells the connection, when it is destroyed, that the request's body has run.
struct ServiceRequest {
  Reply reply;
  InFlightToken token;
};

// The requests of the daemon's request set, and the request to be an onlooker instead of a client. Called
// on the messaging thread or as the work queue's work; the answers come from the work queue. Where an answer
// is a bool it is always true: unknown sessions are not errors.
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
  // The answer comes when the session stops.
  virtual void startReportingSessionForID(ReporterID reporterID, ServiceRequest request) = 0;
  // Sends to the named sessions; without names to every started session, or else to the single-message
  // session.
  virtual void sendMessage(ValueMap message, AudioEventCategory category, AudioEventType type,
                           const ReporterIDs& reporterIDs, ServiceRequest request) = 0;
  virtual void stopReportingSessionForID(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void destroyReportingSession(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void reporterIDValid(ReporterID reporterID, ServiceRequest request) = 0;
  virtual void getAllReporters(ServiceRequest request) = 0;
  // A message for this session comes soon (see RequestHandler). On the work queue.
  virtual void expectMessage(ReporterID /*reporterID*/) {}
  // Keep a request that is to run next in the journal, as a frame or as its values, and return its place
  // there. On the work queue.
  virtual JournalPosition keepFrame(const Method& /*method*/, std::string_view /*frame*/) {
    return JournalPosition();
  }
  virtual JournalPosition keepValues(const Method& /*method*/, const Arguments& /*arguments*/) {
    return JournalPosition();
  }
  // Ends the process. The request is never answered.
  virtual void killService() = 0;
  // Makes the connection an onlooker: it may change nothing, and how long it lasted is not reported.
  virtual void observe(ServiceRequest request) = 0;
};

}  // namespace tonewerk
