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

// Keys of an overload's verdict.
inline constexpr std::string_view kGlitchIDKey = "glitch_id";
inline constexpr std::string_view kGlitchCauseKey = "glitch_cause";
inline constexpr std::string_view kGlitchFirstCauseKey = "glitch_first_cause";
inline constexpr std::string_view kGlitchConfidenceKey = "glitch_confidence";  // 0 to 1
inline constexpr std::string_view kGlitchCulpritApplicationKey = "glitch_culprit_application";
inline constexpr std::string_view kGlitchCulpritProcessKey = "glitch_culprit_process";
inline constexpr std::string_view kGlitchCulpritPIDKey = "glitch_culprit_pid";
inline constexpr std::string_view kGlitchCulpritNodeKey = "glitch_culprit_node";
inline constexpr std::string_view kGlitchNodeKey = "glitch_node";
inline constexpr std::string_view kGlitchDeviceKey = "glitch_device";
inline constexpr std::string_view kGlitchChainKey = "glitch_chain";
inline constexpr std::string_view kGlitchOverKey = "glitch_over_ms";
inline constexpr std::string_view kGlitchPeriodKey = "glitch_period_ms";
inline constexpr std::string_view kGlitchQuantumKey = "glitch_quantum";  // frames
inline constexpr std::string_view kGlitchRateKey = "glitch_rate";        // Hz
inline constexpr std::string_view kGlitchLostKey = "glitch_lost_ms";
inline constexpr std::string_view kGlitchReasonKey = "glitch_reason";
inline constexpr std::string_view kGlitchCyclesKey = "glitch_cycles";  // JSON

// Value of kIssueTypeKey. The daemon counts these messages in its summary of a session.
inline constexpr std::string_view kOverloadIssue = "overload";

}  // namespace tonewerk
