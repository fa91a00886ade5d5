// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <memory>
#include <utility>

#include "platform/accounts/Account.h"

namespace tonewerk {

// Limits how many bytes the sessions of one client keep together: messages, previous values and
// configurations. The client's user is charged for them, in lots, because an account costs more than an
// addition. Used on the work queue.
class KeptBytesBudget {
 public:
  static constexpr std::size_t kMaxKeptBytes = std::size_t{256} << 20;
  static constexpr std::size_t kLotBytes = std::size_t{16} << 10;

  explicit KeptBytesBudget(std::size_t limitBytes) : limit_(limitBytes) {}
  explicit KeptBytesBudget(std::shared_ptr<Account> account = nullptr, std::size_t limitBytes = kMaxKeptBytes)
      : limit_(limitBytes), account_(std::move(account)) {}
  KeptBytesBudget(const KeptBytesBudget&) = delete;
  KeptBytesBudget& operator=(const KeptBytesBudget&) = delete;
  ~KeptBytesBudget() {
    if (account_ != nullptr) account_->give(Resource::kKeptBytes, charged_);
  }

  // The user whose share it takes from; null when there is none.
  const Account* account() const { return account_.get(); }

  // While it lives, what is given back can be taken again, whatever other users take meanwhile.
  class Hold {
   public:
    explicit Hold(KeptBytesBudget& budget) : budget_(budget) { ++budget_.holds_; }
    Hold(const Hold&) = delete;
    Hold& operator=(const Hold&) = delete;
    ~Hold() {
      --budget_.holds_;
      budget_.give(0);
    }

   private:
    KeptBytesBudget& budget_;
  };

  // Takes `bytes`. Returns false, and takes nothing, when they do not fit, here or into the user's share.
  [[nodiscard]] bool take(std::size_t bytes) {
    if (bytes > limit_ - used_ || !charge(used_ + bytes)) return false;
    used_ += bytes;
    return true;
  }
  // Gives back bytes that were taken.
  void give(std::size_t bytes) {
    used_ -= bytes;
    if (account_ == nullptr || holds_ > 0 || charged_ < used_ + 2 * kLotBytes) return;
    const std::size_t surplus = charged_ - used_ - kLotBytes;
    charged_ -= surplus;
    account_->give(Resource::kKeptBytes, surplus);
  }

  std::size_t used() const { return used_; }
  std::size_t limit() const { return limit_; }

  // Returns true on the first call only. The caller logs then, so that each client over its budget is
  // logged once.
  bool isFirstRefusal() {
    const bool first = !hasRefused_;
    hasRefused_ = true;
    return first;
  }

 private:
  // Sees that the user is charged for `bytes` at least.
  [[nodiscard]] bool charge(std::size_t bytes) {
    if (account_ == nullptr || bytes <= charged_) return true;
    const std::size_t missing = bytes - charged_;
    const bool takesLot = missing < kLotBytes && account_->hasRoomFor(Resource::kKeptBytes, kLotBytes);
    return takeLot(takesLot ? kLotBytes : missing);
  }
  [[nodiscard]] bool takeLot(std::size_t bytes) {
    if (!account_->take(Resource::kKeptBytes, bytes)) return false;
    charged_ += bytes;
    return true;
  }

  const std::size_t limit_;
  const std::shared_ptr<Account> account_;
  std::size_t used_ = 0;
  std::size_t charged_ = 0;  // to the account; at least used_
  int holds_ = 0;
  bool hasRefused_ = false;
};

}  // namespace tonewerk
