// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>

#include "driver/TWReportingDriver.h"
#include "platform/Chanmeter.h"

namespace tonewerk {

// Holds the subscription to one driver group's channels. A new one subscribes to nothing.
struct TWReportingIOChannelSubscription {
  explicit TWReportingIOChannelSubscription(TWReportingDriver subscribedDriver)
      : driver(std::move(subscribedDriver)) {}

  TWReportingDriver driver;
  Chanmeter::Subscription subscription;
  Chanmeter::Channels subscribedChannels;  // the group may have more
};

}  // namespace tonewerk
