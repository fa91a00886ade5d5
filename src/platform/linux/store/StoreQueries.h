// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "platform/linux/store/StoreReader.h"

namespace tonewerk {

// The SQL by which StoreReader asks for the rows that pass a filter, oldest first. Parameter 1 is
// kStoreNamesPerRow. Parameters 2 to 10 are the filter's afterId, name, since, until, limit, application,
// device, service and session, of which the optional ones are there only when they have a value. The columns
// are the members of the row's type.

// `knowsSessions`: whether the file's rows do.
std::string messageQuery(const EventFilter& filter, bool knowsSessions);
std::string eventQuery(const EventFilter& filter);
std::string powerQuery(const EventFilter& filter);
std::string metricQuery(const EventFilter& filter);
std::string rtcSessionQuery(const EventFilter& filter);
std::string rtcMessageQuery(const EventFilter& filter);

// Asks for the sums of the power events that pass the filter.
std::string engineOnQuery(const EventFilter& filter);

}  // namespace tonewerk
