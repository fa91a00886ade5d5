// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/Account.h"

#include <algorithm>
#include <cassert>
#include <utility>

namespace tonewerk {
namespace {

// The log lines that a user may cause at once, and then each second.
constexpr LineAllowance::Rate kUserLines{.burst = 4000, .perSecond = 40};

// The most of `total` that a user may hold beside what the others hold.
std::uint64_t shareOf(std::uint64_t total, std::uint64_t others) {
  return (total - std::min(total, others)) / 2;
}

}  // namespace

ResourceTotals::ResourceTotals() {
  for (const ResourceFacts& facts : kResources) totals_[indexOf(facts.resource)] = facts.total;
}

Account::Account(std::uint32_t user, std::shared_ptr<ResourceTotals> totals, const Clock& clock)
    : user_(user), totals_(std::move(totals)), lines_(clock, kUserLines) {}

bool Account::take(Resource resource, std::uint64_t amount) {
  const std::size_t at = indexOf(resource);
  const std::uint64_t total = totals_->totals_[at];
  const std::uint64_t before = held_[at].fetch_add(amount);
  const std::uint64_t allBefore = totals_->held_[at].fetch_add(amount);
  const std::uint64_t others = allBefore - std::min(allBefore, before);
  const bool isFirst = before == 0 && others + amount <= total;
  if (isFirst || before + amount <= shareOf(total, others)) return true;
  held_[at] -= amount;
  totals_->held_[at] -= amount;
  countRefusal(resource);
  return false;
}

void Account::charge(Resource resource, std::uint64_t amount) {
  held_[indexOf(resource)] += amount;
  totals_->held_[indexOf(resource)] += amount;
}

void Account::give(Resource resource, std::uint64_t amount) {
  const std::size_t at = indexOf(resource);
  assert(held_[at] >= amount);
  totals_->held_[at] -= amount;
  held_[at] -= amount;
  if (!isAwaited_[at] || !hasRoom(resource)) return;
  std::vector<std::function<void()>> callbacks;
  {
    const MutexLock lock(mutex_);
    isAwaited_[at] = false;
    callbacks = std::exchange(waiting_[at], {});
  }
  for (const auto& callback : callbacks) callback();
}

std::uint64_t Account::share(Resource resource) const {
  const std::uint64_t all = totals_->held(resource);
  return shareOf(totals_->total(resource), all - std::min(all, held(resource)));
}

// Either give() sees that somebody waits, or this sees the room that it made.
void Account::whenRoom(Resource resource, std::function<void()> callback) {
  const std::size_t at = indexOf(resource);
  {
    const MutexLock lock(mutex_);
    waiting_[at].push_back(std::move(callback));
    isAwaited_[at] = true;
  }
  give(resource, 0);
}

}  // namespace tonewerk
