// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "platform/accounts/Account.h"

namespace tonewerk {

// How many bytes of Resource::kSinkBytes which accounts have to bear for rows that are not written yet. It
// only counts, until charge() or give() is called. The accounts outlive it. Used by one thread at a time.
class StoreCharges {
 public:
  void add(Account& account, std::size_t bytes);
  void add(const StoreCharges& others);
  void clear() { entries_.clear(); }

  bool empty() const { return entries_.empty(); }
  std::size_t of(const Account& account) const;

  // Charges the accounts.
  void charge() const;
  // Gives back what was charged, which may run callbacks of any kind: no lock may be held.
  void give() const;

 private:
  struct Entry {
    Account* account;
    std::size_t bytes;
  };

  // Few users record at the same time, mostly one.
  std::vector<Entry> entries_;
};

}  // namespace tonewerk
