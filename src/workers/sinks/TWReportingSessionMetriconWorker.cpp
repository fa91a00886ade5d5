// SPDX-License-Identifier: Apache-2.0
#include "workers/sinks/TWReportingSessionMetriconWorker.h"

#include <cassert>

#include "platform/Metricon.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingUtility.h"

namespace tonewerk {

const TWReportingSessionWorkerClass TWReportingSessionMetriconWorker::kWorkerClass =
    workerClassOf<TWReportingSessionMetriconWorker>("TWReportingSessionMetriconWorker");

bool TWReportingSessionMetriconWorker::handleMessage(const TWReportingSessionMessage& message) {
  assert(TWReportingUtilityIsOnReportingServerQueue());
  TWReportingContext& context = TWReportingContext::current();
  Metricon& metricon = context.platform().metricon;
  const auto owner = session.lock();
  const AudioServiceType service = owner == nullptr ? kServiceGeneric : owner->serviceType();
  const auto& names = context.names().eventNames(message.category, message.type, service);
  const EventSubject subject{.category = message.category,
                             .type = message.type,
                             .source = message.isDerived ? EventSource::kDerived : EventSource::kClient,
                             .life = owner == nullptr ? nullptr : owner->life(),
                             .stretch = message.details.stretch()};
  metricon.sendEvent(names, subject, [&message] { return message.message; });
  return false;
}

}  // namespace tonewerk
