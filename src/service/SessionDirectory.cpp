// SPDX-License-Identifier: Apache-2.0
#include "service/SessionDirectory.h"

#include "platform/accounts/Account.h"

namespace tonewerk {

const std::shared_ptr<SessionIndex>& SessionDirectory::indexOf(std::uint32_t user) {
  for (const auto& [known, index] : users_) {
    if (known == user) return index;
  }
  return users_.emplace_back(user, std::make_shared<SessionIndex>()).second;
}

SessionIndex::Session SessionDirectory::find(ReporterID reporterID, const Account& requester) const {
  for (const auto& [user, index] : users_) {
    if (user != requester.user()) continue;
    SessionIndex::Session own = index->find(reporterID);
    if (own != nullptr || !requester.isTrusted()) return own;
  }
  return requester.isTrusted() ? findAmongAll(reporterID) : nullptr;
}

SessionIndex::Session SessionDirectory::findAmongAll(ReporterID reporterID) const {
  if (users_.size() == 1) return users_.front().second->find(reporterID);
  SessionIndex::Found first;
  for (const auto& [user, index] : users_) {
    SessionIndex::Found found = index->findWithClient(reporterID);
    if (found.session != nullptr && (first.session == nullptr || found.client < first.client)) {
      first = std::move(found);
    }
  }
  return std::move(first.session);
}

}  // namespace tonewerk
