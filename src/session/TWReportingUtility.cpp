// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingUtility.h"

#include <chrono>
#include <cmath>
#include <cstdio>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/ProcessInformation.h"
#include "platform/SystemInformation.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

// Made once, because every session asks for it several times.
const SharedString kUnknownName("Unknown");

// Writes `maxDigits` fraction digits and removes trailing zeros, but leaves at least `minDigits` of them.
std::string decimalText(double value, int maxDigits, int minDigits) {
  char digits[400];
  std::snprintf(digits, sizeof(digits), "%.*f", maxDigits, value);  // rounds halves to even
  std::string text = digits;
  const std::size_t point = text.find('.');
  if (point == std::string::npos) return text;
  std::size_t size = text.size();
  while (size > point + 1 + static_cast<std::size_t>(minDigits) && text[size - 1] == '0') --size;
  text.resize(size);
  return text;
}

}  // namespace

AudioEventCategory TWReportingUtilityCategoryFromString(std::string_view text) {
  const auto& lookup = TWReportingContext::current().categoryLookup();
  const auto found = lookup.find(std::string(text));
  return found == lookup.end() ? kCategoryUnknown : found->second;
}

AudioEventType TWReportingUtilityTypeFromString(std::string_view text) {
  const auto& lookup = TWReportingContext::current().typeLookup();
  const auto found = lookup.find(std::string(text));
  return found == lookup.end() ? kTypeGeneric : static_cast<AudioEventType>(found->second);
}

double TWReportingUtilityVolumeMinimumPlayingTime(AudioServiceType /*type*/) { return 0.5; }

ValueMap TWReportingUtilityAddDates(const ValueMap& map) {
  const Platform& platform = TWReportingContext::current().platform();
  ValueMap stamped = map;
  stamped.set(TWReportingInternalEventEpochTime, platform.clock.now());
  if (TWReportingContext::current().journal().isRecovering()) return stamped;
  // Computed in single precision, because readers of this value have always got it so.
  const auto ticks = static_cast<float>(platform.processes.processorTimeMicroseconds());
  const float processorMs = ticks / 1000000.0F * 1000.0F;

  stamped.set(TWReportingInternalEventSystemUptimeSec,
              static_cast<std::int32_t>(std::lround(platform.system.uptimeSeconds())));
  stamped.set(TWReportingInternalEventProcessUptimeMS, static_cast<std::int32_t>(std::lround(processorMs)));
  return stamped;
}

double TWReportingUtilityRoundWithPlaces(double value, std::int32_t places) {
  const double factor = std::pow(10.0, static_cast<double>(places));
  return std::round(value * factor) / factor;
}

std::optional<std::string> TWReportingUtilityBucketNumberToString(double value,
                                                                  std::span<const double> buckets,
                                                                  int fractionDigits) {
  const double* best = nullptr;
  double bestDistance = -1.0;
  for (const double& bucket : buckets) {
    const double distance = std::fabs(value - bucket);
    if (bestDistance >= 0.0 && distance > bestDistance) break;
    best = &bucket;
    bestDistance = distance;
  }
  if (best == nullptr) return std::nullopt;
  const int maxDigits = fractionDigits > 0 ? fractionDigits : 0;
  return decimalText(*best, maxDigits, maxDigits > 0 ? 1 : 0);
}

bool TWReportingUtilityKeyIsPresentAndHasChanged(std::string_view key, const ValueMap* first,
                                                 const ValueMap* second) {
  if (first == nullptr || second == nullptr) return false;
  const Value* a = first->find(key);
  const Value* b = second->find(key);
  return a != nullptr && b != nullptr && !(*a == *b);
}

SharedString TWReportingUtilityRetrieveAppName(const ValueMap& configuration) {
  const ValueView name = configuration.view(TWReportingApplicationName);
  if (!name) return kUnknownName;
  const Value* held = name.held();
  if (held != nullptr && held->asString() != nullptr) return *held->asString();
  return name.text();
}

bool TWReportingUtilityWait(TWReportingCondition& condition, double timeoutSeconds, const bool* flag,
                            std::string_view waitingText, std::string_view timeoutText,
                            LogCategory* category) {
  const auto timeout =
      std::chrono::ceil<std::chrono::steady_clock::duration>(std::chrono::duration<double>(timeoutSeconds));
  MutexLock lock(condition.mutex);
  while (!*flag) {
    infoLog(category, "%@", waitingText);
    if (!condition.signalled.waitUntil(lock, std::chrono::steady_clock::now() + timeout)) {
      errorLog(category, "%@", timeoutText);
      return false;
    }
    infoLog(category, "continuing");
  }
  return true;
}

void TWReportingUtilitySignal(TWReportingCondition& condition, bool* flag) {
  const MutexLock lock(condition.mutex);
  *flag = true;
  condition.signalled.notifyOne();
}

bool TWReportingUtilityIsInternalBuild() { return TWReportingContext::current().isInternalBuild(); }

SerialQueue& TWReportingUtilityGetReportingServerQueue() {
  return TWReportingContext::current().reportingServerQueue();
}

bool TWReportingUtilityIsOnReportingServerQueue() {
  return TWReportingContext::current().isOnReportingServerQueue();
}

LogCategory* TWReportingClientCategory() { return &TWReportingContext::current().logCategories.client; }
LogCategory* TWReportingServiceDelegateCategory() {
  return &TWReportingContext::current().logCategories.serviceDelegate;
}
LogCategory* TWReportingSessionCategory() { return &TWReportingContext::current().logCategories.session; }
LogCategory* TWReportingSessionLinkReportCategory() {
  return &TWReportingContext::current().logCategories.linkReport;
}
LogCategory* TWReportingDriverUtilityCategory() {
  return &TWReportingContext::current().logCategories.driverUtility;
}
LogCategory* TWReportingTraceCategory() { return &TWReportingContext::current().logCategories.trace; }
LogCategory* TWReportingEnergybookCategory() {
  return &TWReportingContext::current().logCategories.energybook;
}
LogCategory* TWReportingDiagwireLogCategory() {
  return &TWReportingContext::current().logCategories.diagwire;
}
LogCategory* TWReportingCapsaLogCategory() { return &TWReportingContext::current().logCategories.capsa; }
LogCategory* TWReportingSummaryLogCategory() { return &TWReportingContext::current().logCategories.summary; }
LogCategory* TWReportingDPLogCategory() { return &TWReportingContext::current().logCategories.dp; }

}  // namespace tonewerk
