// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/RtcSummary.h"

#include <algorithm>
#include <string>
#include <unordered_map>
#include <vector>

#include "values/ValueView.h"

namespace tonewerk {
namespace {

// Joined texts under keys, in the order in which the keys first came.
class JoinedTexts {
 public:
  void add(const SharedString& key, ValueView value) {
    const std::size_t place = placeOf(key);
    guess_ = place + 1;
    if (place == texts_.size()) {
      texts_.push_back({key, value.text()});
      return;
    }
    std::string& text = texts_[place].text;
    text += ',';
    if (const auto same = value.asText()) {
      text += *same;
    } else {
      text += value.text();
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
  };
  struct KeyHash {
    std::size_t operator()(const SharedString& key) const { return key.hash(); }
  };
  // The number of texts when the key is new.
  std::size_t placeOf(const SharedString& key) {
    if (guess_ < texts_.size() && texts_[guess_].key.sharesStorageWith(key)) return guess_;
    return places_.try_emplace(key, texts_.size()).first->second;
  }

  std::vector<Text> texts_;
  std::size_t guess_ = 0;  // messages of one kind mostly have their keys in the same order
  std::unordered_map<SharedString, std::size_t, KeyHash> places_;
};

bool isMeantFor(const TWReportingSessionWorkerClass& workerClass, const TWReportingSessionMessage& message) {
  const auto& classes = message.destinationWorkers;
  return classes.empty() || std::find(classes.begin(), classes.end(), &workerClass) != classes.end();
}

}  // namespace

ValueMap rtcSummaryOf(const TWReportingSessionMessages& messages, AudioServiceType serviceType,
                      const TWReportingSessionWorkerClass& workerClass) {
  JoinedTexts summary;
  summary.add("TW_Session_Summary_Event", Value(serviceType));
  for (const auto& message : messages) {
    if (message->isRedundant || !message->isSessionStarted || !isMeantFor(workerClass, *message)) continue;
    message->message.forEach(
        [&summary](const SharedString& key, ValueView value) { summary.add(key, value); });
  }
  return summary.map();
}

}  // namespace tonewerk
