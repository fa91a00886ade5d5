// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SignpostFile.h"

#include <istream>
#include <utility>

#include "platform/JsonService.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

// The object of a line, which ends with a comma unless it is the last one.
std::optional<ValueMap> objectOf(std::string line, const JsonService& json) {
  if (line.ends_with(',')) line.pop_back();
  std::string ignored;
  std::optional<Value> value = json.parse(line, ignored);
  if (!value || value->asMap() == nullptr) return std::nullopt;
  return *value->asMap();
}

// The first line: an object that is not closed yet.
std::optional<ValueMap> contextOf(std::string line, const JsonService& json) {
  if (line.ends_with(',')) line.pop_back();
  const std::optional<ValueMap> head = objectOf(line + "}", json);
  const Value* context = head ? head->find("context") : nullptr;
  if (context == nullptr || context->asMap() == nullptr) return std::nullopt;
  return *context->asMap();
}

std::optional<SignpostInterval> intervalOf(const ValueMap& entry) {
  if (!entry.contains("begin") || !entry.contains("name")) return std::nullopt;
  SignpostInterval interval{.name = std::string(entry.text("name")),
                            .begin = entry.number("begin"),
                            .milliseconds = entry.number("real_time")};
  const bool areTimes = interval.begin >= 0.0 && interval.begin <= Signposts::kLatest &&
                        interval.milliseconds >= 0.0 && interval.milliseconds <= Signposts::kMostMilliseconds;
  return areTimes ? std::optional(std::move(interval)) : std::nullopt;
}

}  // namespace

std::optional<Signposts> readSignposts(std::istream& file, const SignpostFilter& filter,
                                       const JsonService& json, std::string& problem) {
  std::string line;
  const auto context = std::getline(file, line) ? contextOf(line, json) : std::nullopt;
  if (!context) {
    problem = "it is no benchmark data file of a performance trace";
    return std::nullopt;
  }
  if (filter.reporterID &&
      (!context->contains("reporter_id") || context->integer("reporter_id") != *filter.reporterID)) {
    problem = "it is another session's";
    return std::nullopt;
  }
  Signposts signposts;
  while (std::getline(file, line)) {
    const std::optional<ValueMap> entry = objectOf(std::move(line), json);
    std::optional<SignpostInterval> interval = entry ? intervalOf(*entry) : std::nullopt;
    if (!interval) continue;
    signposts.haveTimes = true;
    if (!(interval->begin >= filter.since && interval->begin <= filter.until)) continue;
    if (signposts.intervals.size() < filter.most) {
      signposts.intervals.push_back(*std::move(interval));
    } else {
      ++signposts.leftOut;
    }
  }
  return signposts;
}

}  // namespace tonewerk
