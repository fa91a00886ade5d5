// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "values/Value.h"

namespace tonewerk {

// What a recording may say of a client and of the device. docs/twctl.md explains it to people.
namespace recorded {

// Of a client.
inline constexpr std::string_view kUser = "user";        // a number; also of the device: the daemon's user
inline constexpr std::string_view kProcess = "process";  // a text

// Of the device; these only in a recording's first line.
inline constexpr std::string_view kStartsAt = "starts_at";  // seconds since 1970
inline constexpr std::string_view kUptime = "uptime";       // seconds since the device started
inline constexpr std::string_view kFacts = "facts";         // {"property": boolean}
// These in any line.
inline constexpr std::string_view kThermalLevel = "thermal_level";   // 0 to 3
inline constexpr std::string_view kLowPowerMode = "low_power_mode";  // boolean
inline constexpr std::string_view kLoadAverages = "load_averages";   // three numbers
inline constexpr std::string_view kPreferences = "preferences";      // {"domain": {"key": value}}
inline constexpr std::string_view kNotifications = "notifications";  // {"name": state}
inline constexpr std::string_view kChannels = "channels";  // what each driver publishes, in an array

}  // namespace recorded

// The last second of the year 9999, in seconds since 1970: later times have no text.
inline constexpr double kMaxRecordedTime = 253'402'300'799.0;

// Return what is wrong with the properties, or an empty text.
[[nodiscard]] std::string problemWithClient(const ValueMap& properties);
[[nodiscard]] std::string problemWithDevice(const ValueMap& properties, bool isFirstLine);

}  // namespace tonewerk
