// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "values/Value.h"

namespace tonewerk {

class Account;
class Accounts;

// The most accounts in one answer. They take at most requests::kMaxAccountListingBytes.
inline constexpr std::size_t kMaxListedAccounts = 500;

// Returns {"total", "accounts"}: how many accounts the requester may see, and the first of them, in the order
// of the users' numbers. A trusted user may see all, any other one its own. Each account lists the resources
// that its user holds or was refused. Any thread.
ValueMap accountListing(const Accounts& accounts, const Account& requester);

}  // namespace tonewerk
