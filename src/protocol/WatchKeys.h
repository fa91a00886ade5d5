// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "values/SharedString.h"

namespace tonewerk {

// Keys of the answers to the watch requests.
inline const SharedString kWatchKeyMissed("missed");
inline const SharedString kWatchKeyMessages("messages");
inline const SharedString kWatchKeyReporterID("reporterID");
inline const SharedString kWatchKeyServiceType("serviceType");
inline const SharedString kWatchKeyServiceName("serviceName");
inline const SharedString kWatchKeyCategory("category");
inline const SharedString kWatchKeyType("type");
inline const SharedString kWatchKeyRedundant("redundant");
inline const SharedString kWatchKeyOverloads("overloads");
inline const SharedString kWatchKeyTime("time");
inline const SharedString kWatchKeyApplication("application");
inline const SharedString kWatchKeyDevice("device");
inline const SharedString kWatchKeyPayload("payload");
inline const SharedString kWatchKeyTotal("total");
inline const SharedString kWatchKeySessions("sessions");
inline const SharedString kWatchKeyStarted("started");
inline const SharedString kWatchKeySingleMessageSession("singleMessageSession");
inline const SharedString kWatchKeyProcessIdentifier("processIdentifier");
inline const SharedString kWatchKeyProcessName("processName");
inline const SharedString kWatchKeySeconds("seconds");
inline const SharedString kWatchKeyAccounts("accounts");
inline const SharedString kWatchKeyUser("user");
inline const SharedString kWatchKeyTrusted("trusted");
inline const SharedString kWatchKeyLinesHeldBack("linesHeldBack");
inline const SharedString kWatchKeyResources("resources");
inline const SharedString kWatchKeyName("name");
inline const SharedString kWatchKeyHeld("held");
inline const SharedString kWatchKeyShare("share");
inline const SharedString kWatchKeyRefused("refused");
inline const SharedString kWatchKeySinks("sinks");
inline const SharedString kWatchKeyWaiting("waiting");
inline const SharedString kWatchKeyDropped("dropped");
inline const SharedString kWatchKeyHangs("hangs");
inline const SharedString kWatchKeyDaemon("daemon");
inline const SharedString kWatchKeyVersion("version");
inline const SharedString kWatchKeyStartedAt("startedAt");
inline const SharedString kWatchKeyInternalBuild("internalBuild");
inline const SharedString kWatchKeyRuntime("runtime");
inline const SharedString kWatchKeyState("state");
inline const SharedString kWatchKeyConfiguration("configuration");
inline const SharedString kWatchKeyEndpoints("endpoints");
inline const SharedString kWatchKeyProblem("problem");
inline const SharedString kWatchKeyTroubles("troubles");
inline const SharedString kWatchKeyText("text");
inline const SharedString kWatchKeyTimes("times");

}  // namespace tonewerk
