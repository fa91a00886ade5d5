// SPDX-License-Identifier: Apache-2.0
#include "service/ClientUptime.h"

#include <cmath>

#include "platform/Clock.h"
#include "platform/Log.h"
#include "platform/Metricon.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingUtility.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr char kClientUptimeEvent[] = "com.orvane.tonewerk.twreportingclientuptime";

}  // namespace

void sendClientUptime(std::int32_t processIdentifier, std::optional<double> startDate,
                      const std::optional<std::string>& processName) {
  const LogCategory* log = TWReportingServiceDelegateCategory();
  const Platform& platform = TWReportingContext::current().platform();
  const std::string shownName = processName.value_or("unknown");

  Value seconds(-1);
  if (startDate) {
    const double now = platform.clock.now();
    seconds = std::fabs(now - *startDate);
    if (*startDate > now) {  // the text says the opposite, but readers of the log rely on it
      errorLog(log, "clientStartDate is in the past. clientpid=%d clientprocessname=%@", processIdentifier,
               shownName);
    }
  } else {
    // No error: a client that only checks whether the daemon listens is gone before the work queue
    // registers it.
    infoLog(log, "clientStartDate is nil. clientpid=%d clientprocessname=%@", processIdentifier, shownName);
  }
  infoLog(log, "invalidationHandler: connection exited process=%@ uptime_sec=%d", processName,
          seconds.integer());
  if (!processName) {
    infoLog(log, "clientProcessName is nil. clientpid=%d", processIdentifier);
    return;
  }
  platform.metricon.sendEvent(kClientUptimeEvent, {}, [&] {
    return ValueMap{{"processName", *processName}, {"seconds", seconds}};
  });
}

}  // namespace tonewerk
