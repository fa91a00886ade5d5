// SPDX-License-Identifier: Apache-2.0
#include "session/TWReportingNameTable.h"

#include <algorithm>
#include <string>

#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

constexpr std::size_t kDomainPlaces = 8;    // none, unknown, six known
constexpr std::size_t kBasePlaces = 17;     // undefined, 1 to 16
constexpr std::size_t kTypePlaces = 21;     // generic, 1 to 19, unknown
constexpr std::size_t kServicePlaces = 15;  // 0 to 13, unknown

std::size_t placeOf(AudioEventCategory category) {
  constexpr AudioEventCategory kDomains[] = {0x04000000, 0x08000000, 0x10000000,
                                             0x20000000, 0x40000000, 0x80000000};
  std::size_t domain = 0;
  if (TWReportingUtilityIsABTestModeOn(category)) {
    const auto known = std::find(std::begin(kDomains), std::end(kDomains), category & 0xFFFF0000);
    domain = known == std::end(kDomains) ? 1 : 2 + static_cast<std::size_t>(known - std::begin(kDomains));
  }
  const std::size_t base = category & 0xFFFF;
  return domain * kBasePlaces + (base < kBasePlaces ? base : 0);
}

std::size_t placeOf(AudioEventCategory category, AudioEventType type) {
  const std::size_t typePlace = type == kTypeUnknown ? kTypePlaces - 1 : type < kTypePlaces - 1 ? type : 0;
  return placeOf(category) * kTypePlaces + typePlace;
}

}  // namespace

TWReportingNameTable::TWReportingNameTable() : audioTags_(kDomainPlaces * kBasePlaces * kTypePlaces) {}

const SharedString& TWReportingNameTable::audioTag(AudioEventCategory category, AudioEventType type) {
  SharedString& tag = audioTags_[placeOf(category, type)];
  if (tag.empty()) tag = TWReportingUtilityCategoryString(category) + TWReportingUtilityTypeString(type);
  return tag;
}

const EventNames& TWReportingNameTable::eventNames(AudioEventCategory category, AudioEventType type,
                                                   AudioServiceType service) {
  const std::size_t servicePlace = service < kServicePlaces - 1 ? service : kServicePlaces - 1;
  const auto [names, isNew] =
      eventNames_.try_emplace(placeOf(category, type) * kServicePlaces + servicePlace);
  if (isNew) {
    const std::string ending =
        "." + TWReportingUtilityCategoryString(category) + "." + TWReportingUtilityTypeString(type);
    names->second.first = "com.orvane.tonewerk" + ending;
    names->second.second =
        "com.orvane." + TWReportingUtilityGenerateServiceNameFromServiceType(service) + ending;
  }
  return names->second;
}

}  // namespace tonewerk
