// SPDX-License-Identifier: Apache-2.0
#include "UnusualMessages.h"

#include <algorithm>
#include <chrono>
#include <random>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "values/Value.h"
#include "values/ValueMap.h"

namespace tonewerk {
namespace {

constexpr std::uint32_t kSeed = 20'251'121;
constexpr std::uint32_t kPlayback = 4;
constexpr std::uint16_t kGeneric = 0;
constexpr std::size_t kKeys = 11;
constexpr std::size_t kWideKeys = 512;
// A frame may be nested 32 deep, of which two levels are its own arrays.
constexpr int kLevels = 30;
constexpr std::size_t kLargeBytes = std::size_t{300} * 1024;
constexpr std::size_t kTextBytes = 1024;

// The daemon replaces times that are days old.
double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

std::string keyOf(std::size_t number) { return "entry_" + std::to_string(number); }

std::vector<ValueMapEntry> numberedEntries(std::size_t first, std::size_t count, std::size_t value) {
  std::vector<ValueMapEntry> entries;
  entries.reserve(count);
  for (std::size_t at = 0; at < count; ++at) {
    entries.push_back({SharedString(keyOf(first + at)), Value(value + at)});
  }
  return entries;
}

ValueMap mapOf(const std::vector<ValueMapEntry>& entries) {
  ValueMap map;
  for (const ValueMapEntry& entry : entries) map.set(entry.key, entry.value);
  return map;
}

// One entry changes.
ValueMap wide(std::size_t value) {
  ValueMap map = mapOf(numberedEntries(0, kWideKeys, 1'000));
  map.set("entry_100", Value(100'000 + value));
  return map;
}

ValueMap nested(std::size_t value) {
  ValueMap map{{"value", Value(value)}};
  for (int level = 1; level < kLevels; ++level) map = ValueMap{{"inner", Value(std::move(map))}};
  return map;
}

ValueMap large(std::size_t value) {
  ValueMap map{{"value", Value(value)}};
  const std::string text(kTextBytes, 'x');
  for (std::size_t at = 0; at * kTextBytes < kLargeBytes; ++at) map.set(SharedString(keyOf(at)), Value(text));
  return map;
}

ValueMap payloadOf(UnusualForm form, std::size_t number, std::mt19937& random) {
  switch (form) {
    case UnusualForm::kWide:
      return wide(number);
    case UnusualForm::kNewKeys:
      return mapOf(numberedEntries(100'000 + number * kKeys, kKeys, number));
    case UnusualForm::kNewOrders: {
      std::vector<ValueMapEntry> entries = numberedEntries(0, kKeys, number);
      std::shuffle(entries.begin(), entries.end(), random);
      return mapOf(entries);
    }
    case UnusualForm::kNested:
      return nested(number);
    case UnusualForm::kLarge:
      return large(number);
  }
  return {};
}

}  // namespace

IngestMessages unusualMessages(UnusualForm form, std::int64_t reporterID, std::size_t count) {
  IngestMessages messages;
  std::mt19937 random(kSeed);
  const double start = now();
  for (std::size_t at = 0; at < count; ++at) {
    ValueMap payload = payloadOf(form, at, random);
    payload.set(SharedString(IngestMessages::kTimeKey), Value(start + static_cast<double>(at) * 0.02));
    messages.add({reporterID, kPlayback, kGeneric}, payload);
  }
  return messages;
}

}  // namespace tonewerk
