// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/drivers/XrunWatch.h"

#include <algorithm>
#include <utility>

namespace tonewerk {

namespace {

std::uint32_t increase(std::uint32_t before, std::uint32_t now) { return now >= before ? now - before : now; }

}  // namespace

CycleXruns XrunWatch::update(const ProfiledCycle& cycle) {
  const bool isKnown = drivers_.contains(cycle.driver);
  // A graph has only a few drivers. There are more than kMaxDrivers only if drivers left without a call of
  // retain().
  if (!isKnown && drivers_.size() >= kMaxDrivers) drivers_.clear();
  Driver& driver = drivers_[cycle.driver];

  CycleXruns result;
  result.isRepeat = isKnown && driver.isUnfinished && driver.position == cycle.position;
  if (isKnown) result.driver = increase(driver.xruns, cycle.xruns);
  driver.xruns = cycle.xruns;
  driver.position = cycle.position;
  driver.isUnfinished = std::any_of(cycle.followers.begin(), cycle.followers.end(),
                                    [](const ProfiledFollower& follower) { return !follower.hasFinished; });

  const std::map<std::uint32_t, Follower> before = std::exchange(driver.followers, {});
  for (const ProfiledFollower& follower : cycle.followers) {
    Follower& now = driver.followers[follower.node];
    now = {follower.hasFinished, follower.xruns};
    const auto known = before.find(follower.node);
    if (known == before.end()) continue;
    now.hasEverFinished = follower.hasFinished || known->second.hasEverFinished;
    std::uint32_t xruns = 0;
    if (follower.xruns) {
      xruns = increase(known->second.xruns.value_or(*follower.xruns), *follower.xruns);
    } else if (!follower.hasFinished && known->second.hasEverFinished && !result.isRepeat) {
      xruns = 1;
    }
    if (xruns > 0) result.followers[follower.node] = xruns;
  }
  return result;
}

void XrunWatch::retain(const std::set<std::uint32_t>& drivers) {
  std::erase_if(drivers_, [&](const auto& entry) { return !drivers.contains(entry.first); });
}

}  // namespace tonewerk
