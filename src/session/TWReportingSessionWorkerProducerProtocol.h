// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "session/TWReportingSessionWorkerProtocol.h"

namespace tonewerk {

// Marks a worker that derives messages, normally in its stop(), and sends them back into the session.
class TWReportingSessionWorkerProducerProtocol : public virtual TWReportingSessionWorkerProtocol {};

}  // namespace tonewerk
