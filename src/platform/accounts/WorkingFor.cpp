// SPDX-License-Identifier: Apache-2.0
#include "platform/accounts/WorkingFor.h"

#include <utility>

namespace tonewerk {
namespace {

thread_local const WorkingFor* innermost = nullptr;

}  // namespace

WorkingFor::WorkingFor(const std::shared_ptr<Account>& account, LineAllowance* lines)
    : account_(account), lines_(lines), outer_(std::exchange(innermost, this)) {}

WorkingFor::~WorkingFor() { innermost = outer_; }

std::shared_ptr<Account> WorkingFor::account() {
  return innermost == nullptr ? nullptr : innermost->account_;
}

Account* WorkingFor::accountIfAny() { return innermost == nullptr ? nullptr : innermost->account_.get(); }

LineAllowance* WorkingFor::lines() {
  if (innermost == nullptr) return nullptr;
  if (innermost->lines_ != nullptr) return innermost->lines_;
  return innermost->account_ == nullptr ? nullptr : &innermost->account_->lines();
}

}  // namespace tonewerk
