// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <unistd.h>

#include "platform/accounts/Accounts.h"
#include "support/manual/ManualClock.h"

namespace tonewerk {

// The accounts of a listener in a test, on a clock that stands still.
class TestAccounts {
 public:
  explicit TestAccounts(std::uint32_t owner = ::geteuid()) : accounts_(owner, clock_) {}

  operator Accounts&() { return accounts_; }
  Accounts* operator->() { return &accounts_; }

 private:
  const ManualClock clock_;
  Accounts accounts_;
};

}  // namespace tonewerk
