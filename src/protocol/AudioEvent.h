// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// Says which part of the audio stack a message is about. The low half is a base category from 1 to 16. The
// high half is a bit pattern for the event domain that produced the message, or 0.
using AudioEventCategory = std::uint32_t;

inline constexpr AudioEventCategory kCategoryGeneric = 1;
inline constexpr AudioEventCategory kCategoryInput = 3;
inline constexpr AudioEventCategory kCategoryIo = 7;
inline constexpr AudioEventCategory kCategorySetup = 8;
inline constexpr AudioEventCategory kCategoryError = 11;
inline constexpr AudioEventCategory kCategoryChanmetering = 12;
inline constexpr AudioEventCategory kCategoryVolume = 14;
inline constexpr AudioEventCategory kCategoryGather = 15;
inline constexpr AudioEventCategory kCategoryUnknown = 0xFFFFFFFF;
inline constexpr AudioEventCategory kDomainSession = 0x08000000;

// Says what happened: 0 to 19, or unknown.
using AudioEventType = std::uint16_t;

inline constexpr AudioEventType kTypeGeneric = 0;
inline constexpr AudioEventType kTypeStart = 1;
inline constexpr AudioEventType kTypeStop = 2;
inline constexpr AudioEventType kTypeSetup = 5;
inline constexpr AudioEventType kTypeError = 6;
inline constexpr AudioEventType kTypeIssueDetector = 7;
inline constexpr AudioEventType kTypeEnergybook = 8;
inline constexpr AudioEventType kTypeSummary = 11;
inline constexpr AudioEventType kTypeSimple = 16;
inline constexpr AudioEventType kTypeHistogram = 17;
inline constexpr AudioEventType kTypeState = 18;
inline constexpr AudioEventType kTypeMemoryLog = 19;
inline constexpr AudioEventType kTypeUnknown = 65535;

// Says for which service a session reports: 0 to 13, or unknown.
using AudioServiceType = std::uint16_t;

inline constexpr AudioServiceType kServiceGeneric = 0;
inline constexpr AudioServiceType kServiceAlarms = 4;
inline constexpr AudioServiceType kServiceStandalone = 5;
inline constexpr AudioServiceType kServiceTest = 11;
inline constexpr AudioServiceType kServiceApiUsage = 12;
inline constexpr AudioServiceType kServiceUnknown = 65535;

// Identifies a session; its client chooses it. 0 stands for no session, 1 for the daemon's own single-message
// session.
using ReporterID = std::int64_t;

}  // namespace tonewerk
