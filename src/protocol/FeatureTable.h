// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// The notification that announces changes of the daemon's own preferences.
inline constexpr std::string_view TWReportingNotificationName = "com.orvane.tonewerk.reporting";

// The domain of the daemon's own preferences.
inline constexpr std::string_view kReportingSuite = "com.orvane.tonewerk";

// The keys of a feature's descriptor.
inline constexpr std::string_view kFeatureDefaultsDomain = "defaults_domain";  // the domain of its preference
inline constexpr std::string_view kFeatureDomain = "feature_domain";           // its name
inline constexpr std::string_view kFeatureNotification =
    "notification";  // the notification that announces its changes
inline constexpr std::string_view kFeatureNotifyToken = "notify_token";  // the token of its registration

// Returns the features that the system monitor follows: each name with its descriptor.
ValueMap featureTable();

// Returns the notification that announces a change of this preference to the system monitor; none when the
// monitor does not follow the preference.
[[nodiscard]] std::optional<std::string> notificationOfPreference(std::string_view domain,
                                                                  std::string_view key);

}  // namespace tonewerk
