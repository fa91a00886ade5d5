// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/StateSender.h"

#include <limits>
#include <utility>
#include <vector>

#include "tools/twctl/Pattern.h"
#include "values/CompactJson.h"
#include "values/Value.h"

namespace tonewerk {

void StateSender::send(const DaemonWatch& daemon, const StoredReport::Reading& stored, Time time,
                       double now) {
  if (daemon.answers()) {
    lostAt_.reset();
  } else if (!lostAt_) {
    lostAt_ = now;
  }
  if (time < nextTime_) {
    isHeldBack_ = true;
    return;
  }
  // Also when nothing has changed, because the comparison is the work.
  nextTime_ = time + kLeastPause;
  isHeldBack_ = false;
  std::string text;
  appendCompactJson(text, stateOf(daemon, stored));
  if (text == sent_) return;
  feed_.publish("{\"changed\":" + std::to_string(now) + "," + text.substr(1));
  sent_ = std::move(text);
}

// Without the time, which is no news.
ValueMap StateSender::stateOf(const DaemonWatch& daemon, const StoredReport::Reading& stored) const {
  std::vector<Value> sessions;
  for (const Value& session : daemon.sessions().toValues()) {
    if (isInScope(session.asMap()->text("application"))) sessions.push_back(session);
  }
  return {{"stored", stored.number},
          {"storeProblem", stored.problem},
          {"answers", daemon.answers()},
          {"lost", lostAt_.value_or(std::numeric_limits<double>::quiet_NaN())},
          {"problem", daemon.problem()},
          {"missed", daemon.missed()},
          {"leftOut", daemon.sessions().leftOut()},
          {"sessions", ValueArray(std::move(sessions))}};
}

bool StateSender::isInScope(const std::string& application) const {
  return fitsPattern(application_, application);
}

}  // namespace tonewerk
