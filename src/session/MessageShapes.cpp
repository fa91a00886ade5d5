// SPDX-License-Identifier: Apache-2.0
#include "session/MessageShapes.h"

#include <string_view>
#include <vector>

#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "values/Mix.h"
#include "values/PackedMap.h"

namespace tonewerk {
namespace {

// The number of the keys below, for Shape::Origin::knownSet.
constexpr std::uint32_t kKnownSet = 1;

// In the order of KnownKey.
std::string_view textOf(KnownKey key) {
  switch (key) {
    case KnownKey::kTimestamp:
      return TWReportingInternalEventEpochTime.view();
    case KnownKey::kApplicationName:
      return TWReportingApplicationName.view();
    case KnownKey::kSessionDuration:
      return TWReportingMessageKeySessionDuration;
    case KnownKey::kIssueType:
      return TWReportingMessageKeyIssueType;
  }
  return {};
}

}  // namespace

ValueView knownValue(const ValueMap& message, KnownKey key) {
  const PackedMap* packed = message.packed();
  if (packed == nullptr || packed->shape().origin().knownSet != kKnownSet) return message.view(textOf(key));
  const std::size_t slot = packed->shape().known(static_cast<std::size_t>(key));
  return slot == Shape::kNoSlot ? ValueView() : ValueView(packed->at(slot));
}

MessageShapes::MessageShapes()
    : ShapeTable({TWReportingInternalEventEpochTime, TWReportingApplicationName,
                  TWReportingMessageKeySessionDuration, TWReportingMessageKeyIssueType},
                 kKnownSet) {}

MessageShapes::Completion& MessageShapes::placeOf(const Shape& shape, AudioEventCategory category,
                                                  AudioEventType type) {
  constexpr std::uint64_t kOdd = 0x9E3779B97F4A7C15U;
  const std::uint64_t kind = (std::uint64_t{category} << 16U) | type;
  return remembered_[mix(kind ^ (std::uint64_t{shape.origin().number} << 48U), kOdd) % remembered_.size()];
}

const Shape* MessageShapes::completed(const Shape& shape, AudioEventCategory category, AudioEventType type,
                                      const SharedString* applicationName) {
  const bool isNamed = applicationName != nullptr;
  const Completion& known = placeOf(shape, category, type);
  if (known.shape == &shape && known.category == category && known.type == type && known.isNamed == isNamed &&
      (!isNamed || known.applicationName == *applicationName)) {
    return known.completed;
  }
  const ValueMapEntry tag{TWReportingInternalEventAudioTag,
                          TWReportingContext::current().names().audioTag(category, type)};
  const Shape* completed = isNamed ? extended(shape, {tag, {TWReportingApplicationName, *applicationName}})
                                   : extended(shape, {tag});
  if (completed == nullptr) return nullptr;
  if (known.shape != nullptr && known.shape != &shape && remembered_.size() < kMostRemembered) {
    remembered_ = std::vector<Completion>(2 * remembered_.size());  // messages to come fill it again
  }
  placeOf(shape, category, type) = {
      &shape, category, type, isNamed, isNamed ? *applicationName : SharedString(), completed};
  return completed;
}

}  // namespace tonewerk
