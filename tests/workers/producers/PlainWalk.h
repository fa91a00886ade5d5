// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <functional>
#include <optional>
#include <string_view>
#include <vector>

#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "values/Value.h"

namespace tonewerk {

// Summarises a stream in the plainest way: it merges every message into a map of the latest value of every
// key. Slow; the producers must give the same summaries.
struct PlainWalk {
  enum class Open { kContinues, kIgnored, kNoBegin };

  std::string_view runningKey;
  Open open = Open::kContinues;
  ValueMap state;  // the default values
  std::function<bool(const ValueMap& state, const ValueMap& message)> endsInterval;
  std::function<std::optional<ValueMap>(const ValueMap& state, double seconds, int index)> summaryOf;
  std::function<bool(const ValueMap& message)> begins = [](const ValueMap&) { return true; };
  std::function<void(const ValueMap& state, const ValueMap& message)> collect = [](const ValueMap&,
                                                                                   const ValueMap&) {};

  std::vector<ValueMap> summariesOf(const TWReportingSessionMessages& messages,
                                    const ValueMap& previousValues) {
    const auto timeOf = [](const ValueMap& map) {
      const Value* time = map.find("twreporting_timestamp");
      return time == nullptr ? std::nullopt : std::optional<Value>(*time);
    };
    std::vector<ValueMap> summaries;
    std::optional<Value> begin;
    bool isRunning = false;
    state.merge(previousValues);
    if (state.boolean(runningKey)) {
      if (open == Open::kContinues) {
        isRunning = true;
        begin = timeOf(state);
      }
      if (open == Open::kIgnored) state.erase(runningKey);
    }
    for (const auto& record : messages) {
      const ValueMap& message = record->message;
      const bool wasRunning = state.boolean(runningKey);
      const bool isLast = message.contains("session_duration");
      bool ends = isLast;
      if (message.contains(runningKey)) {
        isRunning = message.boolean(runningKey);
        if (!wasRunning && isRunning && begins(message)) begin = timeOf(message);
        if (!isRunning) ends = true;
      } else if (isLast) {
        isRunning = false;
      }
      if (isRunning) {
        if (endsInterval(state, message)) ends = true;
        collect(state, message);
      }
      if (wasRunning && ends) {
        const std::optional<Value> end = timeOf(message);
        const double seconds = begin && end ? end->number() - begin->number() : 0.0;
        if (seconds > 0.5) {
          if (auto summary = summaryOf(state, seconds, static_cast<int>(summaries.size()) + 1)) {
            summaries.push_back(*summary);
          }
        }
        begin = end;
      }
      if (!isRunning) begin.reset();
      state.merge(message);
    }
    for (ValueMap& summary : summaries) summary.set("msgcnt", summaries.size());
    return summaries;
  }

  static bool changesText(const ValueMap& state, const ValueMap& message, std::string_view key) {
    return state.contains(key) && message.contains(key) && state.text(key) != message.text(key);
  }
  static bool changesNumber(const ValueMap& state, const ValueMap& message, std::string_view key) {
    return state.contains(key) && message.contains(key) && state.number(key) != message.number(key);
  }
  static Value singlePrecision(double seconds) { return static_cast<double>(static_cast<float>(seconds)); }
  static Value bucketed(double seconds) {
    return *TWReportingUtilityBucketNumberToString(seconds, TWReportingUtilityBucketNumberToStringTimes, 0);
  }

  // Merges rapid spatial messages into copies of the records that began the bursts.
  static TWReportingSessionMessages combined(const TWReportingSessionMessages& messages, double maxPause) {
    constexpr std::array<std::string_view, 2> kKeys{"spatial-audio-accessory-feature",
                                                    "spatializationEnabled"};
    TWReportingSessionMessages result;
    std::vector<std::string_view> seen;
    std::shared_ptr<TWReportingSessionMessage> anchor;
    for (const auto& original : messages) {
      const auto message = original->copyWithZone();
      const auto key = std::find_if(kKeys.begin(), kKeys.end(), [&](std::string_view candidate) {
        return message->message.contains(candidate);
      });
      if (key == kKeys.end()) {
        result.push_back(message);
        continue;
      }
      if (std::find(seen.begin(), seen.end(), *key) != seen.end()) {
        seen.clear();
        anchor = nullptr;
      }
      seen.push_back(*key);
      if (anchor != nullptr && message->epochTime() - anchor->epochTime() < maxPause) {
        anchor->message.merge(message->message);
        continue;
      }
      if (anchor == nullptr) anchor = message;
      result.push_back(message);
    }
    return result;
  }
};

}  // namespace tonewerk
