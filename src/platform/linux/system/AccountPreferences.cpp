// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/AccountPreferences.h"

#include <cerrno>
#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <pwd.h>
#include <set>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/PreferenceStore.h"
#include "platform/accounts/Accounts.h"
#include "protocol/RequestSet.h"

namespace tonewerk {
namespace {

std::optional<std::uint32_t> userNamed(const std::string& name) {
  std::vector<char> texts(4096);
  passwd entry{};
  passwd* found = nullptr;
  for (;;) {
    const int error = ::getpwnam_r(name.c_str(), &entry, texts.data(), texts.size(), &found);
    if (error == EINTR) continue;
    if (error == ERANGE && texts.size() < (std::size_t{1} << 20)) {
      texts.resize(texts.size() * 2);
      continue;
    }
    return found == nullptr ? std::nullopt : std::optional<std::uint32_t>(found->pw_uid);
  }
}

std::optional<std::uint32_t> userOf(const Value& value) {
  if (value.asString() != nullptr) return userNamed(value.text());
  if (value.asInteger() == nullptr) return std::nullopt;
  const std::int64_t number = value.integer();
  if (number < 0 || number >= kNoUser) return std::nullopt;
  return static_cast<std::uint32_t>(number);
}

std::set<std::uint32_t> trustedUsers(const PreferenceStore& preferences, const LogCategory& log) {
  std::set<std::uint32_t> users;
  const std::optional<Value> listed =
      preferences.read(AccountPreferences::kPreferenceDomain, AccountPreferences::kTrustedUsersKey);
  if (!listed) return users;
  const ValueArray* list = listed->asArray();
  if (list == nullptr) {
    errorLog(log, "%@ of %@ is no array: %@", AccountPreferences::kTrustedUsersKey,
             AccountPreferences::kPreferenceDomain, *listed);
    return users;
  }
  for (const Value& value : *list) {
    if (const auto user = userOf(value)) {
      users.insert(*user);
    } else {
      errorLog(log, "%@ of %@ names no user of this system: %@", AccountPreferences::kTrustedUsersKey,
               AccountPreferences::kPreferenceDomain, value);
    }
  }
  return users;
}

// None when there is no preference, or it is no number from 1.
std::optional<std::uint64_t> totalOf(const ResourceFacts& facts, const PreferenceStore& preferences,
                                     const LogCategory& log) {
  const std::optional<Value> set = preferences.read(AccountPreferences::kPreferenceDomain, facts.preference);
  if (!set) return std::nullopt;
  const bool isNumber =
      set->asInteger() != nullptr || set->asUnsigned() != nullptr || set->asDouble() != nullptr;
  const double megabytes = set->number();
  if (isNumber && megabytes >= 1 && megabytes <= std::numeric_limits<std::uint32_t>::max()) {
    return static_cast<std::uint64_t>(megabytes * static_cast<double>(kMiB));
  }
  errorLog(log, "%@ of %@ is no number from 1: %@", facts.preference, AccountPreferences::kPreferenceDomain,
           *set);
  return std::nullopt;
}

}  // namespace

void applyAccountPreferences(Accounts& accounts, const PreferenceStore& preferences, const LogCategory& log) {
  accounts.setTrustedUsers(trustedUsers(preferences, log));
  for (const ResourceFacts& facts : kResources) {
    if (facts.preference.empty()) continue;
    accounts.totals().setTotal(facts.resource, totalOf(facts, preferences, log).value_or(facts.total));
  }
}

}  // namespace tonewerk
