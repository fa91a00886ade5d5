// SPDX-License-Identifier: Apache-2.0
#include "tools/journal/SessionChoice.h"

#include <algorithm>
#include <limits>

#include "protocol/Requests.h"

namespace tonewerk {
namespace {

constexpr std::uint32_t kRoot = 0;
// sendMessage's list of sessions.
constexpr std::size_t kSessionsOfMessage = 3;

}  // namespace

bool SessionChoice::takes(const Journal::Origin& origin, const Method& method, const Arguments& arguments) {
  if (method.carriesMessage) return takesMessage(origin, arguments[kSessionsOfMessage]);
  // The last parameter of the requests that change a session is its identifier.
  const bool isOfSession = !method.parameters.empty() &&
                           method.parameters[method.parameters.size() - 1].type == ParameterType::kInt64;
  return isOfSession && method.changesState ? takesCall(origin, method, arguments) : takesAll();
}

void SessionChoice::disconnect(std::uint64_t client) {
  constexpr ReporterID kFirst = std::numeric_limits<ReporterID>::min();
  const auto begin = sessions_.lower_bound({client, kFirst});
  sessions_.erase(begin, sessions_.lower_bound({client + 1, kFirst}));
}

bool SessionChoice::isWithin(double time) const {
  return (!wanted_.since || time >= *wanted_.since) && (!wanted_.until || time <= *wanted_.until);
}

// A message without identifiers that finds no started session is one of no session. It is chosen by its time.
bool SessionChoice::takesMessage(const Journal::Origin& origin, const Argument& sessions) const {
  if (takesAll()) return true;
  const ValueArray* named = sessions ? sessions->asArray() : nullptr;
  if (named != nullptr && named->size() > 0) {
    return std::any_of(sessions_.begin(), sessions_.end(), [&](const auto& entry) {
      return entry.second.isChosen && std::any_of(named->begin(), named->end(), [&](const Value& identifier) {
               return identifier.integer() == entry.first.second;
             });
    });
  }
  bool reachesAny = false;
  for (const auto& [name, session] : sessions_) {
    const bool isReached = session.isStarted && (session.user == origin.user || origin.user == kRoot ||
                                                 origin.user == daemonUser_);
    if (isReached && session.isChosen) return true;
    reachesAny = reachesAny || isReached;
  }
  return !reachesAny && !wanted_.session && isWithin(origin.at);
}

bool SessionChoice::takesCall(const Journal::Origin& origin, const Method& method,
                              const Arguments& arguments) {
  const std::pair name(origin.client, arguments.back()->integer());
  if (method.name == requests::kCreateReportingSession.name) {
    const bool isChosen = (!wanted_.session || *wanted_.session == name.second) && isWithin(origin.at);
    const auto before = sessions_.find(name);
    const bool replacesChosen = before != sessions_.end() && before->second.isChosen;
    if (isChosen) ++chosen_;
    sessions_[name] = {.user = origin.user, .isChosen = isChosen};
    return isChosen || replacesChosen;
  }
  const auto found = sessions_.find(name);
  if (found == sessions_.end()) return takesAll();
  Session& session = found->second;
  const bool isChosen = session.isChosen;
  if (method.name == requests::kStartReportingSessionForID.name) {
    session.isStarted = true;
  } else if (method.name == requests::kStopReportingSessionForID.name) {
    session.isStarted = false;
  } else if (method.name == requests::kSetServiceType.name) {
    // Another type makes another session, which is not started.
    const std::int64_t type = arguments.front()->integer();
    session.isStarted = session.isStarted && session.serviceType == type;
    session.serviceType = type;
  } else if (method.name == requests::kDestroyReportingSession.name) {
    sessions_.erase(found);
  }
  return isChosen;
}

}  // namespace tonewerk
