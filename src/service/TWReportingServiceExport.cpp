// SPDX-License-Identifier: Apache-2.0
#include "service/TWReportingServiceExport.h"

#include <string>
#include <utility>
#include <vector>

#include "service/WatchExport.h"

namespace tonewerk {
namespace {

// In the order of the table below.
enum ServiceMethod : std::size_t {
  kCreateReportingSession,
  kSetServiceType,
  kGetServiceNameForReporterID,
  kSetConfiguration,
  kStartReportingSessionForID,
  kSendMessage,
  kStopReportingSessionForID,
  kDestroyReportingSession,
  kReporterIDValid,
  kGetAllReporters,
  kKillService,
  kObserve,
  kFirstWatchMethod,
};

// Whether it changes sessions or the daemon, rather than asks about them.
bool changesSomething(std::size_t method) {
  switch (method) {
    case kCreateReportingSession:
    case kSetServiceType:
    case kSetConfiguration:
    case kStartReportingSessionForID:
    case kSendMessage:
    case kStopReportingSessionForID:
    case kDestroyReportingSession:
    case kKillService:
      return true;
    default:
      return false;
  }
}

// Of a list of reporter identifiers: what some ten clients with all the sessions they may have come to.
constexpr std::size_t kMaxListBytes = std::size_t{512} << 10;

ReporterID reporterIDOf(const Argument& argument) { return argument->integer(); }
AudioServiceType serviceTypeOf(const Argument& argument) {
  return static_cast<AudioServiceType>(argument->integer());
}

TWReportingServiceProtocol::ReporterIDs reporterIDsOf(const Argument& argument) {
  if (!argument) return std::nullopt;
  const ValueArray& list = *argument->asArray();
  std::vector<ReporterID> identifiers;
  identifiers.reserve(list.size());
  for (const Value& identifier : list) identifiers.push_back(identifier.integer());
  return identifiers;
}

std::vector<Method> requestMethods() {
  constexpr Parameter kReporterID{"reporterID", ParameterType::kInt64};
  constexpr Parameter kServiceType{"serviceType", ParameterType::kUInt16};
  constexpr Result kSuccess{ResultType::kBoolean, "success"};
  return {
      {"createReportingSession", {kReporterID}, kSuccess},
      {"setServiceType", {kServiceType, kReporterID}, kSuccess},
      {"getServiceNameForReporterID", {kReporterID}, {ResultType::kUInt16, "serviceType"}},
      {"setConfiguration", {{"configuration", ParameterType::kMap}, kReporterID}, kSuccess},
      {"startReportingSessionForID", {kReporterID}, kSuccess},
      {"sendMessage",
       {{"message", ParameterType::kMap},
        {"category", ParameterType::kUInt32},
        {"type", ParameterType::kUInt16},
        {"reporterIDs", ParameterType::kInt64ListOrNone}}},
      {"stopReportingSessionForID", {kReporterID}, kSuccess},
      {"destroyReportingSession", {kReporterID}, kSuccess},
      {"reporterIDValid", {kReporterID}, {ResultType::kMap, "validity"}},
      {"getAllReporters", {}, {ResultType::kInt64List, "reporterIDs"}, kMaxListBytes},
      {"killService", {}, {ResultType::kNever, ""}},
      {"observe", {}, kSuccess},
  };
}

}  // namespace

TWReportingServiceExport::TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object,
                                                   std::unique_ptr<RequestHandler> watch)
    : object_(std::move(object)), watch_(std::move(watch)) {}

const RequestSet& TWReportingServiceExport::requestSet() {
  static const RequestSet interface = [] {
    RequestSet all{requestMethods()};
    const std::vector<Method>& watch = WatchExport::methods();
    all.methods.insert(all.methods.end(), watch.begin(), watch.end());
    return all;
  }();
  return interface;
}

std::optional<ReplyError> TWReportingServiceExport::takeRole(std::size_t method) {
  if (method == kObserve) {
    if (role_ == Role::kClient)
      return messagingError(kNotPermitted, "not permitted: observe comes before what changes something");
    role_ = Role::kOnlooker;
  } else if (changesSomething(method)) {
    if (role_ == Role::kOnlooker) {
      return messagingError(kNotPermitted, "not permitted: the connection only looks on since observe, and " +
                                               std::string(requestSet().methods[method].name) +
                                               " changes something");
    }
    role_ = Role::kClient;
  }
  return std::nullopt;
}

void TWReportingServiceExport::handleRequest(std::size_t method, Arguments arguments, Reply reply,
                                             InFlightToken token) {
  if (const std::optional<ReplyError> error = takeRole(method)) return reply(error);
  if (method >= kFirstWatchMethod) {
    return watch_->handleRequest(method - kFirstWatchMethod, std::move(arguments), std::move(reply),
                                 std::move(token));
  }
  ServiceRequest request{std::move(reply), std::move(token)};
  switch (method) {
    case kCreateReportingSession:
      return object_->createReportingSession(reporterIDOf(arguments[0]), std::move(request));
    case kSetServiceType:
      return object_->setServiceType(serviceTypeOf(arguments[0]), reporterIDOf(arguments[1]),
                                     std::move(request));
    case kGetServiceNameForReporterID:
      return object_->getServiceNameForReporterID(reporterIDOf(arguments[0]), std::move(request));
    case kSetConfiguration:
      return object_->setConfiguration(*arguments[0]->asMap(), reporterIDOf(arguments[1]),
                                       std::move(request));
    case kStartReportingSessionForID:
      return object_->startReportingSessionForID(reporterIDOf(arguments[0]), std::move(request));
    case kSendMessage: {
      ValueMap message = *arguments[0]->asMap();
      const auto category = static_cast<AudioEventCategory>(arguments[1]->integer());
      const auto type = static_cast<AudioEventType>(arguments[2]->integer());
      auto identifiers = reporterIDsOf(arguments[3]);
      arguments.clear();  // so that the message's storage is not shared, and the session need not copy it to
                          // change it
      return object_->sendMessage(std::move(message), category, type, std::move(identifiers),
                                  std::move(request));
    }
    case kStopReportingSessionForID:
      return object_->stopReportingSessionForID(reporterIDOf(arguments[0]), std::move(request));
    case kDestroyReportingSession:
      return object_->destroyReportingSession(reporterIDOf(arguments[0]), std::move(request));
    case kReporterIDValid:
      return object_->reporterIDValid(reporterIDOf(arguments[0]), std::move(request));
    case kGetAllReporters:
      return object_->getAllReporters(std::move(request));
    case kKillService:
      return object_->killService();
    case kObserve:
      return object_->observe(std::move(request));
    default:
      return;
  }
}

}  // namespace tonewerk
