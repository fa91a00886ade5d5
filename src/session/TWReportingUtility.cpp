// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingUtility.h"

#include <chrono>
#include <cmath>
#include <cstdio>

#include "platform/Clock.h"
#include "platform/LogLine.h"
#include "platform/ProcessInformation.h"
#include "platform/SystemInformation.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"

namespace tonewerk {
namespace {

constexpr std::array<std::string_view, 17> kBaseTexts{
    "Undefined",         "Generic",     "Record", "Input",         "Playback",     "Output",
    "PlaybackAndRecord", "IO",          "Setup",  "ClientRequest", "RouteChange",  "Error",
    "Chanmetering",      "Performance", "Volume", "Gather",        "HearingHealth"};

struct Domain {
  AudioEventCategory mask;
  std::string_view text;
};
constexpr std::array<Domain, 6> kDomains{{{0x04000000, "MIDI"},
                                          {0x08000000, "Session"},
                                          {0x10000000, "DSP"},
                                          {0x20000000, "HAL"},
                                          {0x40000000, "Routing"},
                                          {0x80000000, "Toolbox"}}};

// "Listeningenhancement" is spelled so on purpose: consumers match on it.
constexpr std::array<std::string_view, 20> kTypeTexts{"Generic",
                                                      "Start",
                                                      "Stop",
                                                      "Activate",
                                                      "Deactivate",
                                                      "Setup",
                                                      "Error",
                                                      "IssueDetector",
                                                      "Energybook",
                                                      "ModulonUsage",
                                                      "MIDIDriver",
                                                      "Summary",
                                                      "HeadphoneAudioExposure",
                                                      "AudioExposure",
                                                      "Listeningenhancement",
                                                      "Pellix",
                                                      "Simple",
                                                      "Histogram",
                                                      "State",
                                                      "MemoryLog"};

constexpr std::array<std::string_view, 14> kServiceNames{
    "generic",         "vocia",         "telephony",        "haptics",          "alarms", "standalone",
    "soundautoconfig", "longformaudio", "nonlongformaudio", "audiodeviceusage", "alerts", "test",
    "apiusage",        "systemsounds"};
constexpr std::string_view kUnknownServiceName = "unknown";

// As many fraction digits as asked for, then without trailing zeros down to `least`.
std::string decimalText(double value, int most, int least) {
  char digits[400];
  std::snprintf(digits, sizeof(digits), "%.*f", most, value);  // rounds halves to even
  std::string text = digits;
  const std::size_t point = text.find('.');
  if (point == std::string::npos) return text;
  std::size_t size = text.size();
  while (size > point + 1 + static_cast<std::size_t>(least) && text[size - 1] == '0') --size;
  text.resize(size);
  return text;
}

}  // namespace

std::string TWReportingUtilityCategoryString(AudioEventCategory category) {
  std::string text;
  if (TWReportingUtilityIsABTestModeOn(category)) {
    for (const Domain& domain : kDomains) {
      if (domain.mask == (category & 0xFFFF0000)) text += domain.text;
    }
    text += '_';
  }
  const AudioEventCategory base = category & 0xFFFF;
  text += kBaseTexts[base < kBaseTexts.size() ? base : 0];
  return text;
}

AudioEventCategory TWReportingUtilityCategoryFromString(std::string_view text) {
  const auto& lookup = TWReportingContext::current().categoryLookup();
  const auto found = lookup.find(std::string(text));
  return found == lookup.end() ? kCategoryUnknown : found->second;
}

std::string TWReportingUtilityTypeString(AudioEventType type) {
  if (type == kTypeUnknown) return "Unknown";
  return std::string(kTypeTexts[type < kTypeTexts.size() ? type : 0]);
}

AudioEventType TWReportingUtilityTypeFromString(std::string_view text) {
  const auto& lookup = TWReportingContext::current().typeLookup();
  const auto found = lookup.find(std::string(text));
  return found == lookup.end() ? kTypeGeneric : static_cast<AudioEventType>(found->second);
}

std::string TWReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType type) {
  return std::string(type < kServiceNames.size() ? kServiceNames[type] : kUnknownServiceName);
}

AudioServiceType TWReportingUtilityGenerateServiceTypeFromServiceName(std::string_view name) {
  for (std::size_t type = 0; type < kServiceNames.size(); ++type) {
    if (kServiceNames[type] == name) return static_cast<AudioServiceType>(type);
  }
  return kServiceUnknown;
}

bool TWReportingUtilityIsABTestModeOn(AudioEventCategory category) {
  return category >= 0x00010000 && category != kCategoryUnknown;
}

double TWReportingUtilityVolumeMinimumPlayingTime(AudioServiceType /*type*/) { return 0.5; }

ValueMap TWReportingUtilityAddDates(const ValueMap& map) {
  const Platform& platform = TWReportingContext::current().platform();
  // Single precision, as readers of this figure have always got it.
  const auto ticks = static_cast<float>(platform.processes.processorTimeMicroseconds());
  const float processorMs = ticks / 1000000.0F * 1000.0F;

  ValueMap stamped = map;
  stamped.set(TWReportingInternalEventEpochTime, platform.clock.now());
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
  const int most = fractionDigits > 0 ? fractionDigits : 0;
  return decimalText(*best, most, most > 0 ? 1 : 0);
}

bool TWReportingUtilityKeyIsPresentAndHasChanged(std::string_view key, const ValueMap* first,
                                                 const ValueMap* second) {
  if (first == nullptr || second == nullptr) return false;
  const Value* a = first->find(key);
  const Value* b = second->find(key);
  return a != nullptr && b != nullptr && !(*a == *b);
}

SharedString TWReportingUtilityRetrieveAppName(const ValueMap& configuration) {
  const Value* name = configuration.find(TWReportingApplicationName);
  if (name == nullptr) return "Unknown";
  if (const SharedString* text = name->asString()) return *text;
  return name->text();
}

bool TWReportingUtilityWait(TWReportingCondition& condition, double timeoutSeconds, const bool* flag,
                            std::string_view waitingText, std::string_view timeoutText,
                            LogCategory* category) {
  const std::chrono::duration<double> timeout(timeoutSeconds);
  std::unique_lock lock(condition.mutex);
  while (!*flag) {
    infoLog(category, "%@", waitingText);
    if (condition.signalled.wait_for(lock, timeout) == std::cv_status::timeout) {
      errorLog(category, "%@", timeoutText);
      return false;
    }
    infoLog(category, "continuing");
  }
  return true;
}

void TWReportingUtilitySignal(TWReportingCondition& condition, bool* flag) {
  const std::lock_guard lock(condition.mutex);
  *flag = true;
  condition.signalled.notify_one();
}

bool TWReportingUtilityIsInternalBuild() { return TWReportingContext::current().isInternalBuild(); }

SerialQueue& TWReportingUtilityGetReportingServerQueue() {
  return TWReportingContext::current().reportingServerQueue();
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
