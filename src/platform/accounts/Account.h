// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "platform/accounts/LineAllowance.h"
#include "platform/accounts/Resource.h"
#include "values/Mutex.h"

namespace tonewerk {

// What all accounts together hold of each resource, and may hold. Any thread.
class ResourceTotals {
 public:
  ResourceTotals();

  std::uint64_t total(Resource resource) const { return totals_[indexOf(resource)].load(); }
  void setTotal(Resource resource, std::uint64_t total) { totals_[indexOf(resource)] = total; }
  std::uint64_t held(Resource resource) const { return held_[indexOf(resource)].load(); }

 private:
  friend class Account;

  std::array<std::atomic<std::uint64_t>, kResources.size()> totals_;
  std::array<std::atomic<std::uint64_t>, kResources.size()> held_{};
};

// Charges one user for what the daemon holds because of that user.
//
// Of each resource a user gets at most half of what the other users have left of the total. So the first user
// gets at most a half, the next a quarter, and there is always something for a user who holds nothing: the
// first piece that a user takes is given whenever the total has room for it.
//
// Any thread.
class Account {
 public:
  // `totals` are those of all accounts. `clock` outlives the account.
  Account(std::uint32_t user, std::shared_ptr<ResourceTotals> totals, const Clock& clock);
  Account(const Account&) = delete;
  Account& operator=(const Account&) = delete;

  // kNoUser when the user is not known.
  std::uint32_t user() const { return user_; }

  // Whether the user may reach the sessions of all users and end the daemon.
  bool isTrusted() const { return isTrusted_.load(std::memory_order_relaxed); }
  void setTrusted(bool isTrusted) { isTrusted_ = isTrusted; }

  // Takes `amount`. False, and nothing is taken, when that would be more than the user's share; the refusal
  // is counted.
  [[nodiscard]] bool take(Resource resource, std::uint64_t amount);
  // Takes `amount` that the daemon holds in any case, whatever the share.
  void charge(Resource resource, std::uint64_t amount);
  // Gives back what was taken or charged. Runs what waits for room.
  void give(Resource resource, std::uint64_t amount);

  std::uint64_t held(Resource resource) const { return held_[indexOf(resource)].load(); }
  // The most that the user may hold now.
  std::uint64_t share(Resource resource) const;
  // Whether the user may take anything at all.
  bool hasRoom(Resource resource) const {
    const std::uint64_t now = held(resource);
    return now == 0 || now < share(resource);
  }

  bool hasRoomFor(Resource resource, std::uint64_t amount) const {
    return held(resource) + amount <= share(resource);
  }

  // Runs `callback` once, on the thread that gives, when the user has room after having had none. At once
  // when there is room. It must not wait, nor use this account's waiting functions.
  void whenRoom(Resource resource, std::function<void()> callback);

  // Counts a request that was refused, or something that was not kept, for lack of `resource`.
  void countRefusal(Resource resource) { ++refused_[indexOf(resource)]; }
  std::uint64_t refused(Resource resource) const { return refused_[indexOf(resource)].load(); }

  // The log lines that all clients of the user together may cause.
  LineAllowance& lines() { return lines_; }
  const LineAllowance& lines() const { return lines_; }

 private:
  const std::uint32_t user_;
  const std::shared_ptr<ResourceTotals> totals_;
  std::atomic<bool> isTrusted_ = false;
  std::array<std::atomic<std::uint64_t>, kResources.size()> held_{};
  std::array<std::atomic<std::uint64_t>, kResources.size()> refused_{};
  LineAllowance lines_;

  std::array<std::atomic<bool>, kResources.size()> isAwaited_{};
  Mutex mutex_;
  std::array<std::vector<std::function<void()>>, kResources.size()> waiting_ GUARDED_BY(mutex_);
};

// Holds an amount of a resource until it is destroyed. Belongs to one thread at a time.
class Charge {
 public:
  Charge() = default;
  // Charges `amount`, whatever the share. Without an account it does nothing.
  Charge(std::shared_ptr<Account> account, Resource resource, std::uint64_t amount)
      : account_(std::move(account)), resource_(resource), amount_(amount) {
    if (account_ != nullptr) account_->charge(resource_, amount_);
  }
  // Charges `amount` if that is within the share of `account`, which is not null. Else it charges nothing,
  // and the refusal is counted.
  static std::optional<Charge> withinShare(std::shared_ptr<Account> account, Resource resource,
                                           std::uint64_t amount) {
    if (!account->take(resource, amount)) return std::nullopt;
    Charge charge;
    charge.account_ = std::move(account);
    charge.resource_ = resource;
    charge.amount_ = amount;
    return charge;
  }
  Charge(Charge&& other) noexcept
      : account_(std::move(other.account_)),
        resource_(other.resource_),
        amount_(std::exchange(other.amount_, 0)) {}
  Charge& operator=(Charge&& other) noexcept {
    if (this != &other) {
      reduceTo(0);
      account_ = std::move(other.account_);
      resource_ = other.resource_;
      amount_ = std::exchange(other.amount_, 0);
    }
    return *this;
  }
  ~Charge() { reduceTo(0); }

  std::uint64_t amount() const { return amount_; }
  // Gives back what is above `amount`.
  void reduceTo(std::uint64_t amount) {
    if (amount >= amount_) return;
    account_->give(resource_, amount_ - amount);
    amount_ = amount;
  }
  // Charges more, or gives back, so that it holds `amount`.
  void setTo(std::uint64_t amount) {
    if (amount > amount_ && account_ != nullptr) {
      account_->charge(resource_, amount - amount_);
      amount_ = amount;
    }
    reduceTo(amount);
  }

 private:
  std::shared_ptr<Account> account_;
  Resource resource_ = Resource::kConnections;
  std::uint64_t amount_ = 0;
};

}  // namespace tonewerk
