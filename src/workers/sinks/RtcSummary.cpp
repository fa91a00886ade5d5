// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/RtcSummary.h"

#include <array>
#include <charconv>
#include <concepts>
#include <cstddef>
#include <limits>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "session/ForEachMessage.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

// Joined texts under keys, in the order in which the keys first came.
class JoinedTexts {
 public:
  void add(const SharedString& key, ValueView value) {
    const std::size_t place = placeOf(key);
    guess_ = place + 1;
    append(texts_[place], value);
  }

  void add(const ValueMap& message) {
    if (const PackedMap* map = message.packed()) {
      const std::vector<std::size_t>& places = placesOf(map->shape());
      map->forEach([&](std::size_t slot, EncodedValue value) { append(texts_[places[slot]], value); });
    } else {
      message.forEach([this](const SharedString& key, ValueView value) { add(key, value); });
    }
  }

  ValueMap map() const {
    ValueMap map;
    map.reserve(texts_.size());
    for (const Text& joined : texts_) map.set(joined.key, joined.text);
    return map;
  }

 private:
  struct Text {
    SharedString key;
    std::string text;
    bool isEmpty = true;  // without a value; a value's text may be empty
  };
  struct KeyHash {
    std::size_t operator()(const SharedString& key) const { return key.hash(); }
  };

  static void append(Text& joined, ValueView value) {
    std::string& text = joined.text;
    if (!std::exchange(joined.isEmpty, false)) text += ',';
    const EncodedValue encoded = value.encoded();
    if (encoded && encoded.isNumber()) {
      encoding::visitNumber(encoded.begin(), [&text](auto number) { append(text, number); });
    } else if (const auto same = value.asText()) {
      text += *same;
    } else {
      text += value.text();
    }
  }
  static void append(std::string& text, bool value) { text += value ? '1' : '0'; }
  static void append(std::string& text, double value) { text += textOf(value); }
  template <std::integral Integer>
  static void append(std::string& text, Integer value) {
    std::array<char, std::numeric_limits<Integer>::digits10 + 2> digits;
    text.append(digits.data(), std::to_chars(digits.data(), digits.data() + digits.size(), value).ptr);
  }

  // Adds a text without a value for a key that is new.
  std::size_t placeOf(const SharedString& key) {
    if (guess_ < texts_.size() && texts_[guess_].key.sharesStorageWith(key)) return guess_;
    const auto [place, isNew] = places_.try_emplace(key, texts_.size());
    if (isNew) texts_.push_back({key, {}});
    return place->second;
  }

  // The place of each slot's key.
  const std::vector<std::size_t>& placesOf(const Shape& shape) {
    std::vector<std::size_t>& places = shapes_[&shape];
    if (places.empty()) {
      for (std::size_t slot = 0; slot < shape.size(); ++slot) {
        places.push_back(placeOf(shape.key(slot)));
        guess_ = places.back() + 1;
      }
    }
    return places;
  }

  std::vector<Text> texts_;
  std::size_t guess_ = 0;  // messages of one kind mostly have their keys in the same order
  std::unordered_map<SharedString, std::size_t, KeyHash> places_;
  // Nobody changes the messages meanwhile, so the shapes live on.
  std::unordered_map<const Shape*, std::vector<std::size_t>> shapes_;
};

}  // namespace

ValueMap rtcSummaryOf(const TWReportingSessionMessages& messages, AudioServiceType serviceType,
                      const TWReportingSessionWorkerClass& workerClass) {
  JoinedTexts summary;
  summary.add("TW_Session_Summary_Event", Value(serviceType));
  forEachMessage(messages, [&](std::size_t, const TWReportingSessionMessage& message) {
    if (message.isRedundant || !message.isSessionStarted || !message.details.areMeantFor(workerClass)) return;
    summary.add(message.message);
  });
  return summary.map();
}

}  // namespace tonewerk
