// SPDX-License-Identifier: Apache-2.0
#include "protocol/EventTexts.h"

#include <array>
#include <cstddef>

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

std::string TWReportingUtilityTypeString(AudioEventType type) {
  if (type == kTypeUnknown) return "Unknown";
  return std::string(kTypeTexts[type < kTypeTexts.size() ? type : 0]);
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

}  // namespace tonewerk
