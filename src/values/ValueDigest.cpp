// SPDX-License-Identifier: Apache-2.0
#include "values/ValueDigest.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>
#include <string_view>

#include "values/ForEach.h"
#include "values/Mix.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr double kTwoTo63 = 9223372036854775808.0;
constexpr double kTwoTo64 = 18446744073709551616.0;

// The meaning of the word that follows: values of different kinds never begin with the same tag.
enum class Tag : std::uint64_t { kNegative = 1, kWhole, kFraction, kNan, kDate, kString, kArray, kMap };

// The keys of this process. Multiplying by an odd factor loses no bits.
struct Keys {
  ValueDigest start{randomKey(), randomKey()};
  ValueDigest factor{randomKey() | 1, randomKey() | 1};
};

const Keys& keys() {
  static const Keys drawn;
  return drawn;
}

// Takes words in order. The two halves use independent keys.
class Digester {
 public:
  void add(std::uint64_t word) {
    state_.first = mix(state_.first ^ word, keys().factor.first);
    state_.second = mix(state_.second ^ word, keys().factor.second);
  }
  void add(Tag tag) { add(static_cast<std::uint64_t>(tag)); }
  void add(ValueView value);
  // Calls visitEntries(visit) to visit all `size` entries.
  template <typename VisitEntries>
  void addMap(std::size_t size, VisitEntries&& visitEntries);

  const ValueDigest& state() const { return state_; }

 private:
  void addText(std::string_view text);
  void addWhole(std::int64_t number);
  void addNumber(double number);
  void addInstant(Date date);

  ValueDigest state_ = keys().start;
};

void Digester::addText(std::string_view text) {
  add(text.size());
  while (!text.empty()) {
    std::uint64_t word = 0;
    const std::size_t count = std::min(text.size(), sizeof(word));
    std::memcpy(&word, text.data(), count);
    add(word);
    text.remove_prefix(count);
  }
}

void Digester::addWhole(std::int64_t number) {
  add(number < 0 ? Tag::kNegative : Tag::kWhole);
  add(static_cast<std::uint64_t>(number));
}

// A double without a fraction is digested like the integer that it equals, if there is one.
void Digester::addNumber(double number) {
  if (std::isnan(number)) return add(Tag::kNan);
  if (std::trunc(number) == number && number >= -kTwoTo63 && number < kTwoTo63) {
    return addWhole(static_cast<std::int64_t>(number));
  }
  const bool isUnsigned = std::trunc(number) == number && number > 0.0 && number < kTwoTo64;
  add(isUnsigned ? Tag::kWhole : Tag::kFraction);
  add(isUnsigned ? static_cast<std::uint64_t>(number) : std::bit_cast<std::uint64_t>(number));
}

void Digester::addInstant(Date date) {
  add(Tag::kDate);
  addNumber(date.seconds);
}

// Digests each entry separately and adds the digests, so that the order does not matter.
template <typename VisitEntries>
void Digester::addMap(std::size_t size, VisitEntries&& visitEntries) {
  ValueDigest sum;
  visitEntries([&](std::string_view key, ValueView value) {
    Digester one;
    one.addText(key);
    one.add(value);
    sum.first += one.state().first;
    sum.second += one.state().second;
  });
  add(Tag::kMap);
  add(size);
  add(sum.first);
  add(sum.second);
}

void Digester::add(ValueView value) {
  switch (value.kind()) {
    case Value::Kind::kBoolean:
      return addWhole(value.boolean() ? 1 : 0);
    case Value::Kind::kInteger:
      return addWhole(value.integer());
    case Value::Kind::kUnsigned:
      add(Tag::kWhole);
      return add(*value.value().asUnsigned());
    case Value::Kind::kDouble:
      return addNumber(value.number());
    case Value::Kind::kString:
      add(Tag::kString);
      return addText(*value.asText());
    case Value::Kind::kDate:
      return addInstant(*value.value().asDate());
    case Value::Kind::kArray:
      add(Tag::kArray);
      add(sizeOf(value));
      forEachElement(value, [this](ValueView element) { add(element); });
      return;
    case Value::Kind::kMap:
      return addMap(sizeOf(value), [&](auto&& visit) { forEachEntry(value, visit); });
  }
}

}  // namespace

ValueDigest ValueDigest::of(const ValueMap& map) {
  Digester digester;
  digester.addMap(map.size(), [&](auto&& visit) {
    map.forEach([&](const SharedString& key, ValueView value) { visit(key.view(), value); });
  });
  return digester.state();
}

}  // namespace tonewerk
