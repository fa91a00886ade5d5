// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/ChannelText.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <optional>

#include "platform/Chanmeter.h"

namespace tonewerk {
namespace {

// In the order of the formats' numbers.
constexpr std::array<std::string_view, 5> kFormatNames{"invalid", "simple", "state", "histogram",
                                                       "simple_array"};

void append(std::string& list, const std::string& item) {
  if (!list.empty()) list += ", ";
  list += item;
}

struct Bucket {
  std::optional<std::int64_t> lower;
  std::optional<std::int64_t> upper;
  std::int64_t hits;
};

Bucket bucketAt(const ChanmeterSample& sample, std::int32_t index) {
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  const std::int64_t hits = sample.histogramBucketHits(index);
  if (sample.histogramBucketBounds(index, lower, upper) != 0) return {{}, {}, hits};
  return {lower, upper, hits};
}

std::string textOf(const Bucket& bucket) {
  const std::string bounds =
      bucket.lower ? std::to_string(*bucket.lower) + "-" + std::to_string(*bucket.upper) : "?";
  return bounds + ": " + std::to_string(bucket.hits);
}

std::string histogramText(const ChanmeterSample& sample) {
  std::string list;
  for (std::int32_t index = 0; index < sample.histogramBucketCount(); ++index) {
    const Bucket bucket = bucketAt(sample, index);
    if (bucket.hits != 0) append(list, textOf(bucket));
  }
  if (list.empty()) return "-";
  return list + " (" + std::to_string(sample.histogramMinValue()) + " to " +
         std::to_string(sample.histogramMaxValue()) + ")";
}

std::string stateText(const ChanmeterSample& sample) {
  std::string list;
  for (std::int32_t index = 0; index < sample.stateCount(); ++index) {
    if (sample.stateResidency(index) == 0 && sample.stateInTransitions(index) == 0) continue;
    append(list, std::string(sample.stateName(index)) + ": " + std::to_string(sample.stateResidency(index)) +
                     " (" + Value(std::round(sample.stateDutyCycle(index) * 1000) / 10).text() + " %)");
  }
  return list.empty() ? "-" : list;
}

ValueArray buckets(const ChanmeterSample& sample) {
  ValueArray list;
  for (std::int32_t index = 0; index < sample.histogramBucketCount(); ++index) {
    const Bucket bucket = bucketAt(sample, index);
    ValueMap fields;
    if (bucket.lower) fields.set("lower", *bucket.lower);
    if (bucket.upper) fields.set("upper", *bucket.upper);
    fields.set("hits", bucket.hits);
    list.append(std::move(fields));
  }
  return list;
}

ValueArray states(const ChanmeterSample& sample) {
  ValueArray list;
  for (std::int32_t index = 0; index < sample.stateCount(); ++index) {
    list.append(ValueMap{{"name", sample.stateName(index)},
                         {"transitions", sample.stateInTransitions(index)},
                         {"residency", sample.stateResidency(index)},
                         {"duty_cycle", sample.stateDutyCycle(index)}});
  }
  return list;
}

Value formatOf(const ChanmeterSample& sample) {
  if (sample.format() < kFormatNames.size()) return kFormatNames[sample.format()];
  return std::int64_t{sample.format()};
}

}  // namespace

std::string channelValueText(const ChanmeterSample& sample) {
  switch (sample.format()) {
    case kChanmeterFormatSimple:
      return std::to_string(sample.simpleIntegerValue());
    case kChanmeterFormatState:
      return stateText(sample);
    case kChanmeterFormatHistogram:
      return histogramText(sample);
    default:
      return "-";
  }
}

ValueMap channelFields(const ChanmeterSample& sample) {
  ValueMap fields;
  const auto add = [&fields](const char* name, const std::optional<std::string_view>& text) {
    if (text) fields.set(name, *text);
  };
  add("driver", sample.driverName());
  add("group", sample.group());
  add("subgroup", sample.subGroup());
  add("name", sample.channelName());
  add("unit", sample.unitLabel());
  fields.set("format", formatOf(sample));
  if (sample.format() == kChanmeterFormatSimple) fields.set("value", sample.simpleIntegerValue());
  if (sample.format() == kChanmeterFormatState) fields.set("states", states(sample));
  if (sample.format() == kChanmeterFormatHistogram) {
    fields.set("min", sample.histogramMinValue());
    fields.set("max", sample.histogramMaxValue());
    fields.set("buckets", buckets(sample));
  }
  return fields;
}

bool isChanged(const ChanmeterSample& sample) {
  if (sample.simpleIntegerValue() != 0) return true;
  for (std::int32_t index = 0; index < sample.histogramBucketCount(); ++index) {
    if (sample.histogramBucketHits(index) != 0) return true;
  }
  for (std::int32_t index = 0; index < sample.stateCount(); ++index) {
    if (sample.stateResidency(index) != 0 || sample.stateInTransitions(index) != 0) return true;
  }
  return false;
}

}  // namespace tonewerk
