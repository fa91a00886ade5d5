// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/StreamDescription.h"

#include "bridges/pipewire/ReportingVocabulary.h"
#include "bridges/pipewire/graph/CleanText.h"

namespace tonewerk {

std::string_view propertyOf(const Properties& properties, std::string_view key) {
  const auto found = properties.find(key);
  return found == properties.end() ? std::string_view() : std::string_view(found->second);
}

bool isOutputStream(const Properties& node) {
  return propertyOf(node, kMediaClassKey) == "Stream/Output/Audio";
}

bool isStream(const Properties& node) {
  return isOutputStream(node) || propertyOf(node, kMediaClassKey) == "Stream/Input/Audio";
}

bool isSink(const Properties& node) {
  // Includes subclasses such as "Audio/Sink/Virtual". A duplex device is a sink for the streams that play to
  // it.
  const std::string_view mediaClass = propertyOf(node, kMediaClassKey);
  return mediaClass.starts_with("Audio/Sink") || mediaClass.starts_with("Audio/Duplex");
}

bool isSource(const Properties& node) { return propertyOf(node, kMediaClassKey).starts_with("Audio/Source"); }

bool isDriver(const Properties& node) {
  const std::string_view driver = propertyOf(node, kNodeDriverKey);
  return driver == "true" || driver == "1";
}

std::string deviceNameOf(const Properties& sink) {
  for (const std::string_view key : {kNodeDescriptionKey, kNodeNickKey, kNodeNameKey}) {
    const std::string_view name = propertyOf(sink, key);
    if (!name.empty()) return cleanText(name);
  }
  return {};
}

std::string applicationOf(const Properties& node, const Properties& client) {
  for (const std::string_view key : {kApplicationIDKey, kApplicationBinaryKey, kApplicationNameKey}) {
    for (const Properties* properties : {&node, &client}) {
      const std::string_view name = propertyOf(*properties, key);
      if (!name.empty()) return cleanText(name);
    }
  }
  return cleanText(propertyOf(node, kNodeNameKey));
}

std::uint16_t serviceTypeOf(std::string_view role) {
  struct Entry {
    std::string_view role;
    std::uint16_t serviceType;
  };
  static constexpr Entry kRoles[] = {
      {"Communication", service::kTelephony},
      {"Music", service::kLongFormAudio},
      {"Movie", service::kLongFormAudio},
      {"Notification", service::kAlerts},
      {"Event", service::kSystemSounds},
      {"Alarm", service::kAlarms},
      {"Test", service::kTest},
  };
  for (const Entry& entry : kRoles) {
    if (entry.role == role) return entry.serviceType;
  }
  return service::kNonLongFormAudio;
}

}  // namespace tonewerk
