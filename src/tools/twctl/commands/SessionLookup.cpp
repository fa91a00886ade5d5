// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/SessionLookup.h"

#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"

namespace tonewerk {

bool lookUpSession(DaemonCalls& daemon, ReporterID reporterID, std::optional<AudioServiceType>& serviceType) {
  serviceType.reset();
  std::optional<Value> validity;
  if (!daemon.call(requests::kReporterIDValid.name, {Value(reporterID)}, validity)) return false;
  const ValueMap* session = validity ? validity->asMap() : nullptr;
  if (session != nullptr && session->integer(TWReporterProxyKeyReporterID) == reporterID)
    serviceType = static_cast<AudioServiceType>(session->integer(TWReporterProxyKeyServiceType));
  return true;
}

}  // namespace tonewerk
