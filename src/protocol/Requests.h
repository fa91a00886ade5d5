// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <string_view>

#include "protocol/RequestSet.h"

namespace tonewerk {

// Keys of the answer to reporterIDValid.
inline constexpr std::string_view TWReporterProxyKeyReporterID = "reporterID";
inline constexpr std::string_view TWReporterProxyKeyServiceType = "serviceType";

// Describes every request that the daemon understands. Clients name requests by these, front ends check
// arguments against them, and the service has a handler for each.
namespace requests {

// The most bytes that an answer of variable size may have. kMaxReportersBytes holds the reporter identifiers
// of about ten clients with as many sessions as they may have.
inline constexpr std::size_t kMaxReportersBytes = std::size_t{512} << 10;
inline constexpr std::size_t kMaxSessionListingBytes = std::size_t{512} << 10;
inline constexpr std::size_t kMaxMessagesBytes = std::size_t{512} << 10;
inline constexpr std::size_t kMaxAccountListingBytes = std::size_t{512} << 10;

inline constexpr Parameter kReporterID{"reporterID", ParameterType::kInt64};
inline constexpr Result kSuccess{ResultType::kBoolean, "success"};

inline constexpr Method kCreateReportingSession{
    .name = "createReportingSession", .parameters = {kReporterID}, .result = kSuccess, .changesState = true};
inline constexpr Method kSetServiceType{.name = "setServiceType",
                                        .parameters = {{"serviceType", ParameterType::kUInt16}, kReporterID},
                                        .result = kSuccess,
                                        .changesState = true};
inline constexpr Method kGetServiceNameForReporterID{.name = "getServiceNameForReporterID",
                                                     .parameters = {kReporterID},
                                                     .result = {ResultType::kUInt16, "serviceType"}};
inline constexpr Method kSetConfiguration{.name = "setConfiguration",
                                          .parameters = {{"configuration", ParameterType::kMap}, kReporterID},
                                          .result = kSuccess,
                                          .changesState = true};
inline constexpr Method kStartReportingSessionForID{.name = "startReportingSessionForID",
                                                    .parameters = {kReporterID},
                                                    .result = kSuccess,
                                                    .changesState = true};
inline constexpr Method kSendMessage{.name = "sendMessage",
                                     .parameters = {{"message", ParameterType::kMap},
                                                    {"category", ParameterType::kUInt32},
                                                    {"type", ParameterType::kUInt16},
                                                    {"reporterIDs", ParameterType::kInt64ListOrNone}},
                                     .changesState = true,
                                     .carriesMessage = true};
inline constexpr Method kStopReportingSessionForID{.name = "stopReportingSessionForID",
                                                   .parameters = {kReporterID},
                                                   .result = kSuccess,
                                                   .changesState = true};
inline constexpr Method kDestroyReportingSession{
    .name = "destroyReportingSession", .parameters = {kReporterID}, .result = kSuccess, .changesState = true};
inline constexpr Method kReporterIDValid{
    .name = "reporterIDValid", .parameters = {kReporterID}, .result = {ResultType::kMap, "validity"}};
inline constexpr Method kGetAllReporters{.name = "getAllReporters",
                                         .result = {ResultType::kInt64List, "reporterIDs"},
                                         .replyBytes = kMaxReportersBytes};
inline constexpr Method kKillService{
    .name = "killService", .result = {ResultType::kNever, ""}, .forTrusted = true, .changesState = true};
inline constexpr Method kObserve{.name = "observe", .result = kSuccess};

// Requests that watch what the daemon does.
inline constexpr Method kWatchSessions{.name = "watch.sessions",
                                       .parameters = {{"first", ParameterType::kInt64}},
                                       .result = {ResultType::kAny, "sessions"},
                                       .replyBytes = kMaxSessionListingBytes,
                                       .forTrusted = true,
                                       .isForSocketOnly = true};
inline constexpr Method kWatchOpenMessages{.name = "watch.openMessages",
                                           .parameters = {{"reporterIDs", ParameterType::kInt64ListOrNone},
                                                          {"categories", ParameterType::kInt64ListOrNone},
                                                          {"types", ParameterType::kInt64ListOrNone}},
                                           .result = {ResultType::kAny, "answer"},
                                           .forTrusted = true,
                                           .isForSocketOnly = true};
inline constexpr Method kWatchNextMessages{.name = "watch.nextMessages",
                                           .result = {ResultType::kAny, "messages"},
                                           .replyBytes = kMaxMessagesBytes,
                                           .forTrusted = true,
                                           .isForSocketOnly = true};

// What users hold. An ordinary user sees its own account, a trusted one all.
inline constexpr Method kWatchAccounts{.name = "watch.accounts",
                                       .result = {ResultType::kAny, "accounts"},
                                       .replyBytes = kMaxAccountListingBytes,
                                       .isForSocketOnly = true};

// All requests, in the order in which they are listed to people.
inline constexpr std::array kAll{kCreateReportingSession,
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
                                 kWatchSessions,
                                 kWatchOpenMessages,
                                 kWatchNextMessages,
                                 kWatchAccounts};
const RequestSet& all();

}  // namespace requests
}  // namespace tonewerk
