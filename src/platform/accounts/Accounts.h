// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <vector>

#include "platform/accounts/Account.h"
#include "values/Mutex.h"

namespace tonewerk {

class Clock;

// The accounts of all users: one for each user that has connected. Any thread.
class Accounts {
 public:
  // Further users, unless they are trusted, get the account of kNoUser, so that the list cannot grow without
  // bound. The front ends turn their clients away.
  static constexpr std::size_t kMaxAccounts = 1024;

  // `owner` is the user that the daemon runs as. `clock` outlives the accounts.
  Accounts(std::uint32_t owner, const Clock& clock);
  Accounts(const Accounts&) = delete;
  Accounts& operator=(const Accounts&) = delete;

  // The account of a user. It is made when it is first asked for, and stays.
  [[nodiscard]] std::shared_ptr<Account> of(std::uint32_t user);
  // What the daemon does for nobody in particular.
  const std::shared_ptr<Account>& own() const { return own_; }

  // Makes these users trusted, beside root and the owner, and no others.
  void setTrustedUsers(std::set<std::uint32_t> users);

  // In order of their users' numbers.
  std::vector<std::shared_ptr<Account>> all() const;

  ResourceTotals& totals() { return *totals_; }
  const ResourceTotals& totals() const { return *totals_; }

 private:
  bool isTrusted(std::uint32_t user) const REQUIRES(mutex_);

  const std::uint32_t owner_;
  const Clock& clock_;
  const std::shared_ptr<ResourceTotals> totals_ = std::make_shared<ResourceTotals>();
  mutable Mutex mutex_;
  std::set<std::uint32_t> trusted_ GUARDED_BY(mutex_);
  std::map<std::uint32_t, std::shared_ptr<Account>> accounts_ GUARDED_BY(mutex_);
  const std::shared_ptr<Account> own_;  // last, because of() makes it
};

}  // namespace tonewerk
