// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sessions/SessionReasons.h"

#include <algorithm>
#include <cmath>
#include <istream>
#include <map>
#include <tuple>
#include <unordered_map>
#include <utility>

#include "platform/JsonService.h"
#include "tools/recording/ReasonKeys.h"
#include "values/CompactJson.h"

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

std::string payloadOf(const ValueMap& message) {
  const Value* payload = message.find(reasons::kPayload);
  ValueMap map = payload == nullptr || payload->asMap() == nullptr ? ValueMap() : *payload->asMap();
  map.erase("twreporting_timestamp");
  std::string text;
  appendCompactJson(text, map);
  return text;
}

// Finds the next message that says what an event says.
class SamePayload {
 public:
  explicit SamePayload(const std::vector<ValueMap*>& messages) {
    for (std::size_t place = 0; place < messages.size(); ++place)
      places_[payloadOf(*messages[place])].push_back(place);
  }

  // The first place from `from` on; none when there is none.
  std::optional<std::size_t> find(const std::string& payload, std::size_t from) const {
    const auto found = places_.find(payload);
    if (found == places_.end()) return std::nullopt;
    const auto next = std::lower_bound(found->second.begin(), found->second.end(), from);
    return next == found->second.end() ? std::nullopt : std::optional(*next);
  }

 private:
  std::unordered_map<std::string, std::vector<std::size_t>> places_;  // ascending
};

// What the daemon made: the values are the store's, so only the order tells which is which.
void nameDerived(ReasonedLife& life, const std::vector<ValueMap*>& messages,
                 const std::vector<const StoredPayload*>& events, const JsonService& json) {
  for (std::size_t place = 0; place < events.size(); ++place) {
    if (place >= messages.size()) {
      life.onlyStored.push_back(*events[place]);
      continue;
    }
    std::string ignored;
    messages[place]->set(kMessageKeyEvent, events[place]->event);
    if (auto payload = json.parse(events[place]->payload, ignored))
      messages[place]->set(reasons::kPayload, *std::move(payload));
  }
  for (std::size_t place = events.size(); place < messages.size(); ++place)
    messages[place]->erase(reasons::kPayload);
}

// What clients sent. When there are as many messages as events, each became the event at its place. Else some
// are missing: the oldest ones, those that no consumer asked for, or the newest ones of a session that runs.
// Then those belong together that say the same.
void nameSent(const std::vector<ValueMap*>& messages, const std::vector<const StoredPayload*>& events) {
  if (messages.size() == events.size()) {
    for (std::size_t place = 0; place < events.size(); ++place)
      messages[place]->set(kMessageKeyEvent, events[place]->event);
    return;
  }
  const SamePayload same(messages);
  std::size_t from = 0;
  for (const StoredPayload* event : events) {
    const std::optional<std::size_t> place = same.find(event->payload, from);
    if (!place) continue;
    messages[*place]->set(kMessageKeyEvent, event->event);
    from = *place + 1;
  }
}

}  // namespace

const ValueMap* ReasonedLife::message(std::int64_t number) const {
  const auto found = std::lower_bound(messages.begin(), messages.end(), number,
                                      [](const ValueMap& message, std::int64_t wanted) {
                                        return message.integer(reasons::kNumber) < wanted;
                                      });
  const bool isFound = found != messages.end() && found->integer(reasons::kNumber) == number;
  return isFound ? &*found : nullptr;
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

const ValueMap* ReasonedLife::messageOf(std::int64_t event) const {
  const auto found = std::find_if(messages.begin(), messages.end(), [event](const ValueMap& message) {
    return message.integer(kMessageKeyEvent) == event;
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

void nameEvents(ReasonedLife& life, const std::vector<StoredPayload>& events, const JsonService& json) {
  // Those of one category, type and source, in order.
  using Kind = std::tuple<std::string, std::string, bool>;
  std::map<Kind, std::pair<std::vector<ValueMap*>, std::vector<const StoredPayload*>>> kinds;
  for (ValueMap& message : life.messages) {
    if (message.boolean(reasons::kRedundant)) continue;
    const Kind kind(message.text(reasons::kCategory), message.text(reasons::kType),
                    message.boolean(reasons::kDerived));
    kinds[kind].first.push_back(&message);
  }
  for (const StoredPayload& event : events) {
    const bool isDerived = event.source == "derived" ||
                           (event.source.empty() && !kinds.contains({event.category, event.type, false}));
    kinds[{event.category, event.type, isDerived}].second.push_back(&event);
  }
  for (const auto& [kind, found] : kinds) {
    if (std::get<bool>(kind)) {
      nameDerived(life, found.first, found.second, json);
    } else {
      nameSent(found.first, found.second);
    }
  }
}

const ReasonedLife* lifeOf(const std::vector<ReasonedLife>& lives, const StoredSession& session) {
  const ReasonedLife* nearest = nullptr;
  double nearestPause = kSameTime;
  for (const ReasonedLife& life : lives) {
    if (life.reporterID != session.reporterID || life.user != session.user || !life.startedAt) continue;
    if (life.process && session.process && *life.process != *session.process) continue;
    const double pause = std::abs(*life.startedAt - session.startedAt);
    if (pause >= nearestPause) continue;
    nearest = &life;
    nearestPause = pause;
  }
  return nearest;
}

}  // namespace tonewerk
