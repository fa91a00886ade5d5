// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

#include "values/SharedString.h"

namespace tonewerk {

// Keys of payloads and configurations. Those that every message has are SharedString constants, so that
// setting them allocates nothing.
inline const SharedString TWReportingInternalEventEpochTime("twreporting_timestamp");
inline const SharedString TWReportingMessageKeyTWTimestamp = TWReportingInternalEventEpochTime;
inline const SharedString TWReportingInternalEventInvalidTimestamp("invalid_timestamp");
inline const SharedString TWReportingInternalEventAudioTag("audiotag");
inline const SharedString TWReportingApplicationName("HostApplicationDisplayID");
inline const SharedString TWReportingMessageKeyIsSessionStarted("isSessionStarted");

inline constexpr std::string_view TWReportingInternalEventProcessUptimeMS = "processuptime_ms";
inline constexpr std::string_view TWReportingInternalEventSystemUptimeSec = "systemuptime_sec";
inline constexpr std::string_view TWReportingQMApplicationName = "QMHostApplicationDisplayID";

// Keys of a test session's configuration: what is traced, and where the benchmark data file is written.
inline constexpr std::string_view TWReportingKolviPlistFilePath = "TWReportingKolviPlistFilePath";
inline constexpr std::string_view TWReportingKolviOutputFileName = "TWReportingKolviOutputFileName";
inline constexpr std::string_view TWReportingKolviOutputFileDirectory = "TWReportingKolviOutputFileDirectory";

inline constexpr std::string_view TWReportingMessageKeySessionOutputRunning = "session_output_running";
inline constexpr std::string_view TWReportingMessageKeySessionInputRunning = "session_input_running";
inline constexpr std::string_view TWReportingMessageKeySessionDuration = "session_duration";
inline constexpr std::string_view TWReportingMessageKeySelectedFormat = "session_selected_format";
inline constexpr std::string_view TWReportingMessageKeyActiveDevices = "active_devices";
inline constexpr std::string_view TWReportingMessageKeyFormatID = "mFormatID";
inline constexpr std::string_view TWReportingMessageKeySpatialAudioAccessoryFeature =
    "spatial-audio-accessory-feature";
inline constexpr std::string_view TWReportingMessageKeySpatializationEnabled = "spatializationEnabled";
inline constexpr std::string_view TWReportingMessageKeyRingerState = "ringerstate";
inline constexpr std::string_view TWReportingMessageKeyChannelsPerFrame = "mChannelsPerFrame";
inline constexpr std::string_view TWReportingMessageKeyVolume = "QMSessionVolume";
inline constexpr std::string_view TWReportingMessageKeyVolumeBucketed = "QMSessionVolumeBucketed";
inline constexpr std::string_view TWReportingMessageKeyPlayseconds = "play_seconds";
inline constexpr std::string_view TWReportingMessageKeyPlaysecondsBucketed = "play_secondsBucketed";
inline constexpr std::string_view TWReportingMessageKeyGatherSession = "gather_session";
inline constexpr std::string_view TWReportingMessageKeyVpConfigOperationMode = "vp_config_operation_mode";
inline constexpr std::string_view TWReportingMessageKeyVpConfigInputPort = "vp_config_input_port";
inline constexpr std::string_view TWReportingMessageKeyVpConfigPrimaryVocoder = "vp_config_primary_vocoder";
inline constexpr std::string_view TWReportingMessageKeyVpConfigPrimaryVocoderFs =
    "vp_config_primary_vocoderFs";
inline constexpr std::string_view TWReportingMessageKeyInputrunningSeconds = "inputrunning_seconds";
inline constexpr std::string_view TWReportingMessageKeyInputrunningSecondsBucketed =
    "inputrunning_secondsBucketed";
inline constexpr std::string_view TWReportingMessageKeyVocoders = "vocoders";
inline constexpr std::string_view TWReportingMessageKeyMessageIndex = "msgidx";
inline constexpr std::string_view TWReportingMessageKeyMessageCount = "msgcnt";
inline constexpr std::string_view TWReportingMessageKeyIssueType = "issue_type";

}  // namespace tonewerk
