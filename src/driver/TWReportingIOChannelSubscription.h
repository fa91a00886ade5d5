// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>

#include "driver/TWReportingDriver.h"
#include "platform/Chanmeter.h"

namespace tonewerk {

// What is subscribed of one driver group; nothing when it is made.
struct TWReportingIOChannelSubscription {
  explicit TWReportingIOChannelSubscription(TWReportingDriver ofDriver) : driver(std::move(ofDriver)) {}

  TWReportingDriver driver;
  Chanmeter::Subscription subscription;
  Chanmeter::Channels subscribedChannels;  // may be fewer than the group's
};

}  // namespace tonewerk
