// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SessionReasons.h"

#include <algorithm>
#include <cmath>
#include <istream>
#include <map>

#include "platform/JsonService.h"
#include "tools/recording/ReasonKeys.h"

namespace tonewerk {
namespace {

// A recording has the times of the journal, but for the last digits.
constexpr double kSameTime = 0.001;

// False for a line that has no known meaning there.
bool takeOfWalk(const std::string& what, const ValueMap& line, ReasonedLife::Walk& walk) {
  const bool isStep = what == reasons::kRapid || what == reasons::kStretch || what == reasons::kStretchEnd;
  if (isStep) walk.steps.push_back(line);
  if (what == reasons::kWalkEnd) walk.end = line;
  return isStep || what == reasons::kWalkEnd;
}

bool take(const ValueMap& line, ReasonedLife& life) {
  const std::string what = line.text(reasons::kWhat);
  if (what == reasons::kBegin) {
    life.reporterID = line.integer(reasons::kReporter);
    life.user = line.integer(reasons::kUser);
    if (line.contains(reasons::kProcess)) life.process = line.text(reasons::kProcess);
    if (line.contains(reasons::kAt)) life.startedAt = line.number(reasons::kAt);
  } else if (what == reasons::kMessage) {
    life.messages.push_back(line);
  } else if (what == reasons::kWalk) {
    life.walks.push_back({.about = line, .steps = {}, .end = {}});
  } else if (what == reasons::kEnd) {
    life.end = line;
  } else {
    return !life.walks.empty() && takeOfWalk(what, line, life.walks.back());
  }
  return true;
}

}  // namespace

const ValueMap* ReasonedLife::message(std::int64_t number) const {
  const auto found = std::find_if(messages.begin(), messages.end(), [number](const ValueMap& message) {
    return message.integer(reasons::kNumber) == number;
  });
  return found == messages.end() ? nullptr : &*found;
}

std::vector<const ValueMap*> ReasonedLife::equalTo(std::int64_t number) const {
  const ValueMap* asked = message(number);
  const bool isRedundant = asked != nullptr && asked->boolean(reasons::kRedundant);
  const std::int64_t first = isRedundant ? asked->integer(reasons::kRepeats) : number;
  std::vector<const ValueMap*> found;
  for (const ValueMap& message : messages) {
    const bool isFirst = message.integer(reasons::kNumber) == first && first != 0;
    const bool repeatsIt =
        message.boolean(reasons::kRedundant) && message.integer(reasons::kRepeats) == first;
    if (isFirst || (repeatsIt && first != 0) || &message == asked) found.push_back(&message);
  }
  return found;
}

const ValueMap* ReasonedLife::summaryEnd(const std::string& category, std::int64_t index) const {
  const Walk* found = walk(category);
  if (found == nullptr) return nullptr;
  const auto given = std::find_if(found->steps.begin(), found->steps.end(), [index](const ValueMap& step) {
    return step.contains(reasons::kIndex) && step.integer(reasons::kIndex) == index;
  });
  return given == found->steps.end() ? nullptr : &*given;
}

const ValueMap* ReasonedLife::messageOf(const StoredEventRow& event) const {
  constexpr double kSameSeconds = 1e-4;
  const auto found = std::find_if(messages.begin(), messages.end(), [&](const ValueMap& message) {
    return message.text(reasons::kCategory) == event.category && message.text(reasons::kType) == event.type &&
           !message.boolean(reasons::kRedundant) && event.sentAt &&
           std::abs(message.number(reasons::kAt) - *event.sentAt) < kSameSeconds;
  });
  return found == messages.end() ? nullptr : &*found;
}

const ReasonedLife::Walk* ReasonedLife::walk(const std::string& category) const {
  const auto found = std::find_if(walks.begin(), walks.end(), [&category](const Walk& walk) {
    return walk.about.text(reasons::kCategory) == category;
  });
  return found == walks.end() ? nullptr : &*found;
}

std::optional<std::vector<ReasonedLife>> readReasons(std::istream& text, const JsonService& json,
                                                     std::string& problem) {
  std::map<std::int64_t, ReasonedLife> lives;
  std::size_t number = 0;
  for (std::string line; std::getline(text, line);) {
    ++number;
    const std::optional<Value> value = json.parse(line, problem);
    const ValueMap* map = value ? value->asMap() : nullptr;
    if (map == nullptr || !take(*map, lives[map->integer(reasons::kLife)])) {
      problem = "line " + std::to_string(number) + " of the reasons has another form";
      return std::nullopt;
    }
  }
  std::vector<ReasonedLife> all;
  all.reserve(lives.size());
  for (auto& [place, life] : lives) all.push_back(std::move(life));
  return all;
}

const ReasonedLife* lifeOf(const std::vector<ReasonedLife>& lives, const StoredSession& session) {
  const auto found = std::find_if(lives.begin(), lives.end(), [&session](const ReasonedLife& life) {
    return life.reporterID == session.reporterID && life.user == session.user &&
           (!life.process || !session.process || *life.process == *session.process) && life.startedAt &&
           std::abs(*life.startedAt - session.startedAt) < kSameTime;
  });
  return found == lives.end() ? nullptr : &*found;
}

}  // namespace tonewerk
