// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/ChannelNumbers.h"

#include <algorithm>
#include <cassert>
#include <charconv>
#include <concepts>
#include <cstring>
#include <optional>
#include <system_error>

#include "platform/linux/json/JsonNumbers.h"

namespace tonewerk {
namespace {

// The shortest text around a number that a record uses, such as `"hits":1`.
constexpr std::size_t kMinBytesOfNumber = 8;

bool isNumber(const JsonTree::Node& node) {
  return node.kind == JsonTree::Kind::kInteger || node.kind == JsonTree::Kind::kUnsigned ||
         node.kind == JsonTree::Kind::kDouble;
}

// The functions below return the position after the number at the beginning of `text`; null if there is none
// in the usual form or range.

template <std::integral T>
const char* readInteger(std::string_view text, T& number) {
  const std::size_t first = text.starts_with('-') ? 1 : 0;
  // JSON has no further digit after a leading zero, std::from_chars() has.
  const bool hasLeadingZero =
      text.size() > first + 1 && text[first] == '0' && text[first + 1] >= '0' && text[first + 1] <= '9';
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  return hasLeadingZero || error != std::errc() ? nullptr : end;
}

const char* readDouble(std::string_view text, double& number) {
  const std::string_view digits = leadingJsonNumber(text);
  const char* last = digits.data() + digits.size();
  const auto [end, error] = std::from_chars(digits.data(), last, number);
  if (digits.empty() || error != std::errc() || end != last) return nullptr;
  // An integer has no negative zero.
  if (number == 0 && digits == "-0") number = 0;
  return end;
}

const char* readNumber(std::string_view text, const ChannelNumbers::Target& target,
                       std::vector<ChanmeterRecord>& records) {
  using Field = ChannelNumbers::Field;
  if (target.field == Field::kIgnored) {
    double ignored = 0;
    return readDouble(text, ignored);
  }
  ChanmeterRecord& record = records[target.record];
  switch (target.field) {
    case Field::kIgnored:
      break;
    case Field::kValue:
      return readInteger(text, record.value);
    case Field::kMinimum:
      return readInteger(text, record.minimum);
    case Field::kMaximum:
      return readInteger(text, record.maximum);
    case Field::kTransitions:
      return readInteger(text, record.states[target.element].transitions);
    case Field::kResidency:
      return readInteger(text, record.states[target.element].residency);
    case Field::kDutyCycle:
      return readDouble(text, record.states[target.element].dutyCycle);
    case Field::kLower:
      return readInteger(text, *record.buckets[target.element].lower);
    case Field::kUpper:
      return readInteger(text, *record.buckets[target.element].upper);
    case Field::kHits:
      return readInteger(text, record.buckets[target.element].hits);
  }
  return nullptr;
}

}  // namespace

ChannelNumbers::ChannelNumbers(std::string_view text, const JsonTree& json, std::vector<Use> uses) {
  const std::vector<JsonNumber> places = numbersInJson(text);
  if (places.size() > text.size() / kMinBytesOfNumber) return;
  std::sort(uses.begin(), uses.end(), [](const Use& a, const Use& b) { return a.number < b.number; });
  numbers_.reserve(places.size());
  auto use = uses.begin();
  const JsonTree::Node* node = &json.root();
  for (const JsonNumber& place : places) {
    while (node != JsonTree::end(json.root()) && !isNumber(*node)) ++node;
    assert(node != JsonTree::end(json.root()));
    Number& number = numbers_.emplace_back(Number{place.begin, place.end, {}});
    if (use != uses.end() && use->number == node) number.target = use++->target;
    ++node;
  }
}

bool ChannelNumbers::read(std::string_view previous, std::string_view text,
                          std::vector<ChanmeterRecord>& records) {
  if (numbers_.empty()) return false;
  const char* at = text.data();
  const char* const end = at + text.size();
  const auto skipSame = [&](std::string_view same) {
    if (static_cast<std::size_t>(end - at) < same.size() || std::memcmp(at, same.data(), same.size()) != 0) {
      return false;
    }
    at += same.size();
    return true;
  };
  std::size_t done = 0;  // of `previous`
  for (Number& number : numbers_) {
    if (!skipSame(previous.substr(done, number.begin - done))) return false;
    done = number.end;
    const char* const begin = at;
    at = readNumber({begin, end}, number.target, records);
    if (at == nullptr) return false;
    number.begin = static_cast<std::uint32_t>(begin - text.data());
    number.end = static_cast<std::uint32_t>(at - text.data());
  }
  return skipSame(previous.substr(done)) && at == end;
}

}  // namespace tonewerk
