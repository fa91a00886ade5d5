// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/SdBus.h"

#include <gtest/gtest.h>
#include <limits>
#include <systemd/sd-bus.h>

#include "platform/linux/dbus/PrivateBus.h"

namespace tonewerk {
namespace {

using std::chrono::hours;
using std::chrono::milliseconds;
using std::chrono::seconds;

class SdBusTest : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(daemon_.isRunning());
    bus_ = openBus(daemon_.address(), problem_);
    ASSERT_NE(bus_, nullptr) << problem_;
    while (sd_bus_is_ready(bus_.get()) == 0) process();
    process();
  }

  // Handles what has arrived, or waits a short time for it.
  void process() const {
    int processed = 1;
    while (processed > 0) processed = sd_bus_process(bus_.get(), nullptr);
    ASSERT_GE(processed, 0);
    sd_bus_wait(bus_.get(), 10'000);  // microseconds
  }

  PrivateBus daemon_;
  std::string problem_;
  Bus bus_;
};

// The daemon once woke up every minute for each of its connections.
TEST_F(SdBusTest, AnIdleConnectionNeedsNoWorkForADay) {
  const milliseconds next = timeToNextBusWork(bus_.get());
  EXPECT_EQ(next, hours(24));
  EXPECT_LE(next.count(), std::numeric_limits<int>::max());  // poll() takes an int
}

TEST_F(SdBusTest, ACallNeedsWorkWhenItTimesOut) {
  sd_bus_message* made = nullptr;
  ASSERT_GE(sd_bus_message_new_method_call(bus_.get(), &made, "org.freedesktop.DBus", "/org/freedesktop/DBus",
                                           "org.freedesktop.DBus", "GetId"),
            0);
  const BusMessage call(made);
  const auto ignore = [](sd_bus_message*, void*, sd_bus_error*) { return 0; };
  const auto timeout = std::chrono::duration_cast<std::chrono::microseconds>(seconds(20));
  ASSERT_GE(sd_bus_call_async(bus_.get(), nullptr, call.get(), ignore, nullptr,
                              static_cast<std::uint64_t>(timeout.count())),
            0);
  EXPECT_LE(timeToNextBusWork(bus_.get()), seconds(20));
}

}  // namespace
}  // namespace tonewerk
