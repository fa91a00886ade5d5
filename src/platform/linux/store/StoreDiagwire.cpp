// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreDiagwire.h"

#include "platform/Clock.h"
#include "platform/linux/protobuf/ProtozeroWriter.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/pb/Base.h"

namespace tonewerk {

void StoreDiagwire::post(std::uint32_t metricIdentifier, const PB::Base& record) {
  ProtozeroWriter writer;
  record.writeTo(writer);
  store_.record(MetricRow{clock_.now(), metricIdentifier, writer.bytes()});
}

}  // namespace tonewerk
