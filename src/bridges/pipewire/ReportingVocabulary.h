// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string_view>

// The numbers and keys of the reporting protocol that this bridge sends.
namespace tonewerk {

namespace service {
inline constexpr std::uint16_t kTelephony = 2;
inline constexpr std::uint16_t kAlarms = 4;
inline constexpr std::uint16_t kLongFormAudio = 7;
inline constexpr std::uint16_t kNonLongFormAudio = 8;
inline constexpr std::uint16_t kAlerts = 10;
inline constexpr std::uint16_t kTest = 11;
inline constexpr std::uint16_t kSystemSounds = 13;
}  // namespace service

inline constexpr std::uint32_t kOutputCategory = 5;
inline constexpr std::uint32_t kIOCategory = 7;
inline constexpr std::uint16_t kGenericType = 0;
inline constexpr std::uint16_t kStopType = 2;
inline constexpr std::uint16_t kErrorType = 6;

// Keys of a session's configuration.
inline constexpr std::string_view kApplicationKey = "HostApplicationDisplayID";

// Keys of messages.
inline constexpr std::string_view kTimestampKey = "twreporting_timestamp";   // seconds since 1970
inline constexpr std::string_view kRunningKey = "session_output_running";    // boolean
inline constexpr std::string_view kVolumeKey = "QMSessionVolume";            // 0 to 1
inline constexpr std::string_view kDevicesKey = "active_devices";            // text
inline constexpr std::string_view kFormatKey = "session_selected_format";    // text
inline constexpr std::string_view kFormatIDKey = "mFormatID";                // text
inline constexpr std::string_view kChannelsKey = "mChannelsPerFrame";        // integer
inline constexpr std::string_view kSessionDurationKey = "session_duration";  // seconds
inline constexpr std::string_view kIssueTypeKey = "issue_type";
inline constexpr std::string_view kBufferFramesKey = "smallest_buffer_frame_size";
inline constexpr std::string_view kCycleKey = "io_cycle";
inline constexpr std::string_view kXrunCountKey = "xrun_count";

// Value of kIssueTypeKey. The daemon counts these messages in its summary of a session.
inline constexpr std::string_view kOverloadIssue = "overload";

}  // namespace tonewerk
