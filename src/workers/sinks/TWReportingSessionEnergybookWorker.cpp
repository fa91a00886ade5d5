// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionEnergybookWorker.h"

#include <cassert>
#include <string_view>
#include <utility>

#include "platform/Energybook.h"
#include "platform/Log.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingKeys.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"
#include "values/ValueView.h"

namespace tonewerk {
namespace {

constexpr std::int32_t kEventGroup = 28;
const SharedString kEngineOnDurationEvent("Flumen_Haptics_EngineOnDuration");
const SharedString kClientStatusEvent("Flumen_Haptics_ClientStatus");
const SharedString kLeakedSessionEvent("LeakedHapticsSessionInfo");

// Keys of the messages.
constexpr std::string_view kEngineOnTime = "EngineOnTime";
constexpr std::string_view kEngineState = "EngineState";
// Keys of messages and events alike.
constexpr std::string_view kActiveHardwareTime = "Haptic_Active_Hardware_Time_Seconds";
constexpr std::string_view kActiveClients = "Active_Clients";
// Keys of the events.
constexpr std::string_view kEngineOnDuration = "EngineOnDuration";
constexpr std::string_view kStatus = "Status";
constexpr std::string_view kApplicationName = "ApplicationName";
constexpr std::string_view kTimestampEnd = "TimestampEnd";

const Value kEngineOn("EngineOn");
constexpr std::string_view kUnknownApplication = "Unknown";

void send(const SharedString& name, ValueMap payload) {
  TWReportingContext::current().platform().energybook.sendEvent(kEventGroup, name, std::move(payload));
}

}  // namespace

const TWReportingSessionWorkerClass TWReportingSessionEnergybookWorker::kWorkerClass =
    workerClassOf<TWReportingSessionEnergybookWorker>("TWReportingSessionEnergybookWorker");

bool TWReportingSessionEnergybookWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  if (message.type != kTypeEnergybook) return false;
  handleEngineOnDurationMessage(message.message);
  handleEngineStateMessage(message.message);
  handleLongRunningMessage(message.message);
  return false;
}

void TWReportingSessionEnergybookWorker::handleEngineOnDurationMessage(const ValueMap& message) const {
  const ValueView engineOnTime = message.view(kEngineOnTime);
  if (!engineOnTime) return;
  ValueMap payload{{kEngineOnDuration, engineOnTime.value()}};
  const SharedString application = applicationName();
  if (application != kUnknownApplication) {
    payload.set(kApplicationName, application);
  } else {
    errorLog(TWReportingEnergybookCategory(), "failed to get app name for energybook");
  }
  if (const ValueView timestamp = message.view(TWReportingMessageKeyTWTimestamp)) {
    payload.set(kTimestampEnd, timestamp.value());
  } else {
    errorLog(TWReportingEnergybookCategory(), "failed to get TWReporting timestamp for energybook");
  }
  send(kEngineOnDurationEvent, std::move(payload));
}

void TWReportingSessionEnergybookWorker::handleEngineStateMessage(const ValueMap& message) const {
  const ValueView engineState = message.view(kEngineState);
  if (!engineState) return;
  // Unlike for a duration, an unknown application is sent as such, and missing values are not logged.
  ValueMap payload{{kStatus, engineState == ValueView(kEngineOn)}, {kApplicationName, applicationName()}};
  if (const ValueView timestamp = message.view(TWReportingMessageKeyTWTimestamp)) {
    payload.set(kTimestampEnd, timestamp.value());
  }
  send(kClientStatusEvent, std::move(payload));
}

void TWReportingSessionEnergybookWorker::handleLongRunningMessage(const ValueMap& message) {
  const ValueView activeTime = message.view(kActiveHardwareTime);
  if (!activeTime) return;
  ValueMap payload{{kActiveHardwareTime, activeTime.value()}};
  if (const ValueView clients = message.view(kActiveClients)) payload.set(kActiveClients, clients.value());
  send(kLeakedSessionEvent, std::move(payload));
}

SharedString TWReportingSessionEnergybookWorker::applicationName() const {
  const auto owner = session.lock();
  return TWReportingUtilityRetrieveAppName(owner == nullptr ? ValueMap() : owner->configuration());
}

}  // namespace tonewerk
