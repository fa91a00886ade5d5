// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// The name under which the daemon's own preferences are announced as changed.
inline constexpr std::string_view TWReportingNotificationName = "com.orvane.tonewerk.reporting";

// The domain of the daemon's own preferences.
inline constexpr std::string_view kReportingSuite = "com.orvane.tonewerk";

// The keys of a feature's descriptor.
inline constexpr std::string_view kFeatureDefaultsDomain = "defaults_domain";  // where its preference is
inline constexpr std::string_view kFeatureDomain = "feature_domain";           // its name
inline constexpr std::string_view kFeatureNotification = "notification";       // announces its changes
inline constexpr std::string_view kFeatureNotifyToken = "notify_token";        // of its registration

// The features that the system monitor follows: a descriptor each, by its name.
ValueMap featureTable();

// The notification that announces a change of this preference to the system monitor; none for one that it
// does not follow.
[[nodiscard]] std::optional<std::string> notificationOfPreference(std::string_view domain,
                                                                  std::string_view key);

}  // namespace tonewerk
