// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

namespace tonewerk {

class Accounts;
class LogCategory;
class PreferenceStore;

// The preferences that set who is trusted and what users may hold.
struct AccountPreferences {
  static constexpr std::string_view kPreferenceDomain = "com.orvane.tonewerk.service";
  // Names and numbers of users, beside root and the daemon's own user.
  static constexpr std::string_view kTrustedUsersKey = "trusted_users";
};

// Sets the trusted users and the totals of `accounts` as the preferences say. What is wrong, such as the name
// of a user that the system does not know, is logged and left out; a missing preference has its default. May
// wait, because the system's users may be those of a network.
void applyAccountPreferences(Accounts& accounts, const PreferenceStore& preferences, const LogCategory& log);

}  // namespace tonewerk
