// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>

#include "platform/accounts/Account.h"

namespace tonewerk {

// Names the user for whom the calling thread works, as long as it lives: what the thread hands to the store
// and to the other sinks, and the lines that it logs, are that user's. Scopes nest; the innermost counts.
//
// Work that is passed to another thread takes the account along: account() there, and a scope here.
class WorkingFor {
 public:
  // `account` and `lines` outlive the scope. Without `lines` the account's own allowance holds.
  explicit WorkingFor(const std::shared_ptr<Account>& account, LineAllowance* lines = nullptr);
  WorkingFor(const WorkingFor&) = delete;
  WorkingFor& operator=(const WorkingFor&) = delete;
  ~WorkingFor();

  // Null when the thread works for nobody in particular.
  static std::shared_ptr<Account> account();
  static Account* accountIfAny();
  static LineAllowance* lines();

 private:
  const std::shared_ptr<Account>& account_;
  LineAllowance* const lines_;
  const WorkingFor* const outer_;
};

}  // namespace tonewerk
