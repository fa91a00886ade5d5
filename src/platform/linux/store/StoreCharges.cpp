// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreCharges.h"

#include <algorithm>

namespace tonewerk {

void StoreCharges::add(Account& account, std::size_t bytes) {
  const auto found = std::find_if(entries_.begin(), entries_.end(),
                                  [&](const Entry& entry) { return entry.account == &account; });
  if (found == entries_.end()) {
    entries_.push_back({&account, bytes});
  } else {
    found->bytes += bytes;
  }
}

void StoreCharges::add(const StoreCharges& others) {
  for (const Entry& entry : others.entries_) add(*entry.account, entry.bytes);
}

std::size_t StoreCharges::of(const Account& account) const {
  const auto found = std::find_if(entries_.begin(), entries_.end(),
                                  [&](const Entry& entry) { return entry.account == &account; });
  return found == entries_.end() ? 0 : found->bytes;
}

void StoreCharges::charge() const {
  for (const Entry& entry : entries_) entry.account->charge(Resource::kSinkBytes, entry.bytes);
}

void StoreCharges::give() const {
  for (const Entry& entry : entries_) entry.account->give(Resource::kSinkBytes, entry.bytes);
}

}  // namespace tonewerk
