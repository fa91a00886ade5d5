// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "platform/Log.h"
#include "protocol/AudioEvent.h"
#include "protocol/EventTexts.h"
#include "values/Mutex.h"
#include "values/Value.h"

namespace tonewerk {

class SerialQueue;

// The daemon's shared vocabulary. Free functions, any thread; those that read the process's state do so
// through TWReportingContext::current().

// Exact texts of the base categories and "Unknown"; everything else, domains included, is kCategoryUnknown.
AudioEventCategory TWReportingUtilityCategoryFromString(std::string_view text);

// Exact texts; "MemoryLog" is not read back. Everything else is kTypeGeneric.
AudioEventType TWReportingUtilityTypeFromString(std::string_view text);

inline ReporterID TWReportingUtilityExtractSessionIDFromReporterID(ReporterID reporterID) {
  return reporterID;
}

// Seconds below which playing is not reported; the same for every service.
double TWReportingUtilityVolumeMinimumPlayingTime(AudioServiceType type);

// A copy stamped with the wall-clock time, the system's uptime in whole seconds and the daemon's processor
// time in whole milliseconds.
ValueMap TWReportingUtilityAddDates(const ValueMap& map);

// Halves away from zero. Negative places round to tens, hundreds and so on.
double TWReportingUtilityRoundWithPlaces(double value, std::int32_t places);

// Seconds, and volumes from 0 to 1 in steps of a sixteenth.
inline constexpr std::array<double, 11> TWReportingUtilityBucketNumberToStringTimes{
    0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000};
inline constexpr std::array<double, 17> TWReportingUtilityBucketNumberToStringVolumes{
    0.0,    0.0625, 0.125,  0.1875, 0.25,   0.3125, 0.375,  0.4375, 0.5,
    0.5625, 0.625,  0.6875, 0.75,   0.8125, 0.875,  0.9375, 1.0};

// The bucket nearest to `value`, of two as near the later, as text with at most so many fraction digits, at
// least one unless none is asked for. Buckets ascend: the walk ends at the first that is farther. None
// without buckets.
std::optional<std::string> TWReportingUtilityBucketNumberToString(double value,
                                                                  std::span<const double> buckets,
                                                                  int fractionDigits);

// Present in both and different.
bool TWReportingUtilityKeyIsPresentAndHasChanged(std::string_view key, const ValueMap* first,
                                                 const ValueMap* second);

// The configuration's "HostApplicationDisplayID", or "Unknown".
SharedString TWReportingUtilityRetrieveAppName(const ValueMap& configuration);

// What TWReportingUtilityWait() waits on.
struct TWReportingCondition {
  Mutex mutex;
  Condition signalled;
};

// Waits until `*flag` is true, at most `timeoutSeconds` a round; true when it is. The flag belongs to the
// caller and is read and written only under the condition's lock. Blocks the calling thread: never on the
// work queue while the signaller needs that queue.
[[nodiscard]] bool TWReportingUtilityWait(TWReportingCondition& condition, double timeoutSeconds,
                                          const bool* flag, std::string_view waitingText,
                                          std::string_view timeoutText, LogCategory* category);
void TWReportingUtilitySignal(TWReportingCondition& condition, bool* flag);

bool TWReportingUtilityIsInternalBuild();
inline bool TWReportingUtilityShouldSendMessage() { return true; }
SerialQueue& TWReportingUtilityGetReportingServerQueue();
// True where what lives on that queue may be used, for assertions; see TWReportingContext.
bool TWReportingUtilityIsOnReportingServerQueue();

// One log category an area.
LogCategory* TWReportingClientCategory();
LogCategory* TWReportingServiceDelegateCategory();
LogCategory* TWReportingSessionCategory();
LogCategory* TWReportingSessionLinkReportCategory();
LogCategory* TWReportingDriverUtilityCategory();
LogCategory* TWReportingTraceCategory();
LogCategory* TWReportingEnergybookCategory();
LogCategory* TWReportingDiagwireLogCategory();
LogCategory* TWReportingCapsaLogCategory();
LogCategory* TWReportingSummaryLogCategory();
LogCategory* TWReportingDPLogCategory();

}  // namespace tonewerk
