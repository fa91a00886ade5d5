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

// Functions that many parts of the daemon use. Any thread. Those that need the process's state read it
// through TWReportingContext::current().

// Reads the exact text of a base category or "Unknown". Every other text, also one with a domain, gives
// kCategoryUnknown.
AudioEventCategory TWReportingUtilityCategoryFromString(std::string_view text);

// Reads the exact text of a type, except "MemoryLog". Every other text gives kTypeGeneric.
AudioEventType TWReportingUtilityTypeFromString(std::string_view text);

inline ReporterID TWReportingUtilityExtractSessionIDFromReporterID(ReporterID reporterID) {
  return reporterID;
}

// The seconds below which playing is not reported. They are the same for every service.
double TWReportingUtilityVolumeMinimumPlayingTime(AudioServiceType type);

// Returns a copy of `map` with the wall-clock time, the system's uptime in whole seconds and the daemon's
// processor time in whole milliseconds. In a recovery only the first: the others say nothing about the time
// before the crash. On the work queue.
ValueMap TWReportingUtilityAddDates(const ValueMap& map);

// Rounds to so many decimal places, halves away from zero. Negative places round to tens, hundreds and so on.
double TWReportingUtilityRoundWithPlaces(double value, std::int32_t places);

// Buckets of times in seconds, and of volumes from 0 to 1 in steps of a sixteenth.
inline constexpr std::array<double, 11> TWReportingUtilityBucketNumberToStringTimes{
    0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000};
inline constexpr std::array<double, 17> TWReportingUtilityBucketNumberToStringVolumes{
    0.0,    0.0625, 0.125,  0.1875, 0.25,   0.3125, 0.375,  0.4375, 0.5,
    0.5625, 0.625,  0.6875, 0.75,   0.8125, 0.875,  0.9375, 1.0};

// Returns the bucket nearest to `value` as text; of two equally near ones the later. The text has at most
// `fractionDigits` fraction digits, and at least one unless that is 0. Buckets must ascend: the search ends
// at the first one that is farther. Returns none without buckets.
std::optional<std::string> TWReportingUtilityBucketNumberToString(double value,
                                                                  std::span<const double> buckets,
                                                                  int fractionDigits);

// True when the key is in both maps and its values differ. A null map has no keys.
bool TWReportingUtilityKeyIsPresentAndHasChanged(std::string_view key, const ValueMap* first,
                                                 const ValueMap* second);

// Returns the configuration's "HostApplicationDisplayID", or "Unknown".
SharedString TWReportingUtilityRetrieveAppName(const ValueMap& configuration);

// The condition that TWReportingUtilityWait() waits for.
struct TWReportingCondition {
  Mutex mutex;
  Condition signalled;
};

// Waits until `*flag` is true and returns true. Returns false when `timeoutSeconds` pass without a wake-up;
// each wake-up without the flag begins them again. The flag belongs to the caller and is read and written
// only under the condition's lock. Blocks the calling thread: do not call it on the work queue if the
// signal comes from there.
[[nodiscard]] bool TWReportingUtilityWait(TWReportingCondition& condition, double timeoutSeconds,
                                          const bool* flag, std::string_view waitingText,
                                          std::string_view timeoutText, LogCategory* category);
void TWReportingUtilitySignal(TWReportingCondition& condition, bool* flag);

bool TWReportingUtilityIsInternalBuild();
inline bool TWReportingUtilityShouldSendMessage() { return true; }
SerialQueue& TWReportingUtilityGetReportingServerQueue();
// True where objects that live on that queue may be used. For assertions; see TWReportingContext.
bool TWReportingUtilityIsOnReportingServerQueue();

// The log categories, one for each area.
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
