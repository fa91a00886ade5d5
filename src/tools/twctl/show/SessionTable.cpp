// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/SessionTable.h"

#include "protocol/EventTexts.h"

namespace tonewerk {

SessionTable::SessionTable(const Tool& tool) : table_(tool, {"reporterID", "serviceType", "serviceName"}) {}

void SessionTable::add(ReporterID reporterID, AudioServiceType serviceType) {
  table_.add({Value(reporterID), Value(serviceType),
              Value(TWReportingUtilityGenerateServiceNameFromServiceType(serviceType))});
}

}  // namespace tonewerk
