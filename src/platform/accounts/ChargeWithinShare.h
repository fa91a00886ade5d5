// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <utility>

#include "platform/accounts/Account.h"

namespace tonewerk {

// Charges `amount` to `account`, which is not null, if that is within its share. Else it charges nothing, and
// the refusal is counted.
inline std::optional<Charge> chargeWithinShare(const std::shared_ptr<Account>& account, Resource resource,
                                               std::uint64_t amount) {
  if (!account->take(resource, amount)) return std::nullopt;
  return Charge::ofTaken(account, resource, amount);
}

}  // namespace tonewerk
