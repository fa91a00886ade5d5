// SPDX-License-Identifier: Apache-2.0
#include "service/AccountListing.h"

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/accounts/Accounts.h"
#include "protocol/WatchKeys.h"

namespace tonewerk {
namespace {

ValueMap shown(const Account& account) {
  std::vector<Value> resources;
  for (const ResourceFacts& facts : kResources) {
    const std::uint64_t held = account.held(facts.resource);
    const std::uint64_t refused = account.refused(facts.resource);
    if (held == 0 && refused == 0) continue;
    resources.emplace_back(ValueMap{{kWatchKeyName, std::string(facts.name)},
                                    {kWatchKeyHeld, held},
                                    {kWatchKeyShare, account.share(facts.resource)},
                                    {kWatchKeyRefused, refused}});
  }
  return {{kWatchKeyUser, account.user()},
          {kWatchKeyTrusted, account.isTrusted()},
          {kWatchKeyLinesHeldBack, account.lines().heldBack()},
          {kWatchKeyResources, ValueArray(std::move(resources))}};
}

}  // namespace

ValueMap accountListing(const Accounts& accounts, const Account& requester) {
  std::size_t total = 0;
  std::vector<Value> listed;
  for (const auto& account : accounts.all()) {
    if (account->user() != requester.user() && !requester.isTrusted()) continue;
    if (++total <= kMaxListedAccounts) listed.emplace_back(shown(*account));
  }
  return {{kWatchKeyTotal, total}, {kWatchKeyAccounts, ValueArray(std::move(listed))}};
}

}  // namespace tonewerk
