// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk::channels {

// Make channel records with little text:
//
//   chanmeter.setRecords({simple(speaker("Rail Volts"), 12), histogram(speaker("Delay"), {{0, 10, 5}})});

inline ChanmeterKey keyIn(std::optional<std::string> group, std::optional<std::string> name,
                          std::optional<std::string> driver = "Amp") {
  return {.driver = std::move(driver), .group = std::move(group), .name = std::move(name)};
}

inline ChanmeterKey speaker(std::string name) { return keyIn("Speaker", std::move(name)); }

inline ChanmeterRecord simple(ChanmeterKey key, std::int64_t value) {
  return {.key = std::move(key), .format = kChanmeterFormatSimple, .value = value};
}

inline ChanmeterRecord states(ChanmeterKey key, std::vector<ChanmeterState> held) {
  return {.key = std::move(key), .format = kChanmeterFormatState, .states = std::move(held)};
}

inline ChanmeterRecord histogram(ChanmeterKey key, std::vector<ChanmeterBucket> buckets) {
  return {.key = std::move(key), .format = kChanmeterFormatHistogram, .buckets = std::move(buckets)};
}

inline ChanmeterRecord ofFormat(ChanmeterKey key, ChanmeterFormat format) {
  return {.key = std::move(key), .format = format};
}

inline ChanmeterRecords shared(std::vector<ChanmeterRecord> records) {
  ChanmeterRecords made;
  for (ChanmeterRecord& record : records) {
    made.push_back(std::make_shared<const ChanmeterRecord>(std::move(record)));
  }
  return made;
}

inline std::vector<ChanmeterRecord> plain(const ChanmeterRecords& records) {
  std::vector<ChanmeterRecord> made;
  for (const auto& record : records) made.push_back(*record);
  return made;
}

}  // namespace tonewerk::channels
