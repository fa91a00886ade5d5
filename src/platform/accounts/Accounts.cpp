// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/Accounts.h"

#include <utility>

#include "protocol/RequestSet.h"

namespace tonewerk {

Accounts::Accounts(std::uint32_t owner, const Clock& clock) : owner_(owner), clock_(clock), own_(of(owner)) {}

std::shared_ptr<Account> Accounts::of(std::uint32_t user) {
  const MutexLock lock(mutex_);
  if (accounts_.size() >= kMaxAccounts && !accounts_.contains(user) && !isTrusted(user)) user = kNoUser;
  std::shared_ptr<Account>& account = accounts_[user];
  if (account == nullptr) {
    account = std::make_shared<Account>(user, totals_, clock_);
    account->setTrusted(isTrusted(user));
  }
  return account;
}

bool Accounts::isTrusted(std::uint32_t user) const {
  return user == 0 || (user == owner_ && user != kNoUser) || trusted_.contains(user);
}

void Accounts::setTrustedUsers(std::set<std::uint32_t> users) {
  users.erase(kNoUser);
  const MutexLock lock(mutex_);
  trusted_ = std::move(users);
  for (const auto& [user, account] : accounts_) account->setTrusted(isTrusted(user));
}

std::vector<std::shared_ptr<Account>> Accounts::all() const {
  const MutexLock lock(mutex_);
  std::vector<std::shared_ptr<Account>> accounts;
  accounts.reserve(accounts_.size());
  for (const auto& [user, account] : accounts_) accounts.push_back(account);
  return accounts;
}

}  // namespace tonewerk
