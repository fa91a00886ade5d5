// SPDX-License-Identifier: Apache-2.0
#include "service/SinkListing.h"

#include <utility>
#include <vector>

#include "platform/SinkStatus.h"
#include "protocol/WatchKeys.h"

namespace tonewerk {

ValueArray sinkListing(const SinkList& sinks) {
  std::vector<Value> listed;
  for (const SinkStatus& status : sinks.all()) {
    listed.emplace_back(ValueMap{{kWatchKeyName, status.name},
                                 {kWatchKeyWaiting, status.waiting},
                                 {kWatchKeyDropped, status.dropped},
                                 {kWatchKeyHangs, static_cast<std::int64_t>(status.hangs.count())}});
  }
  return ValueArray(std::move(listed));
}

}  // namespace tonewerk
