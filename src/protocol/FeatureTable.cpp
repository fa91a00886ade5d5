// SPDX-License-Identifier: Apache-2.0
#include "protocol/FeatureTable.h"

namespace tonewerk {

ValueMap featureTable() {
  const ValueMap descriptors[] = {
      {{kFeatureDefaultsDomain, "com.orvane.homedeck"},
       {kFeatureDomain, "spatial-audio-accessory-feature"},
       {kFeatureNotification, "com.orvane.homedeck.spatial-audio-accessory-feature.changed"}},
      {{kFeatureDefaultsDomain, kReportingSuite},
       {kFeatureDomain, "device_name"},
       {kFeatureNotification, TWReportingNotificationName}},
      {{kFeatureDomain, "ringerstate"}, {kFeatureNotification, "com.orvane.homedeck.ringerstate"}},
  };
  ValueMap features;
  for (const ValueMap& descriptor : descriptors) features.set(descriptor.text(kFeatureDomain), descriptor);
  return features;
}

std::optional<std::string> notificationOfPreference(std::string_view domain, std::string_view key) {
  // One notification announces all of the daemon's own preferences.
  if (domain == kReportingSuite) return std::string(TWReportingNotificationName);
  const ValueMap features = featureTable();
  const Value* feature = features.find(key);
  if (feature == nullptr) return std::nullopt;
  const ValueMap& descriptor = *feature->asMap();
  const Value* preferences = descriptor.find(kFeatureDefaultsDomain);
  if (preferences == nullptr || *preferences != Value(domain)) return std::nullopt;
  return descriptor.text(kFeatureNotification);
}

}  // namespace tonewerk
