// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/PowerProfileWatcher.h"

#include <array>
#include <chrono>
#include <deque>
#include <gtest/gtest.h>
#include <systemd/sd-bus.h>

#include "platform/linux/dbus/PrivateBus.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

constexpr char kName[] = "net.hadess.PowerProfiles";
constexpr char kPath[] = "/net/hadess/PowerProfiles";

int answerProfile(sd_bus*, const char*, const char*, const char*, sd_bus_message* answer, void* data,
                  sd_bus_error*) {
  return sd_bus_message_append(answer, "s", static_cast<const std::string*>(data)->c_str());
}

constexpr std::array<sd_bus_vtable, 3> kTable = {{
    SD_BUS_VTABLE_START(0),
    SD_BUS_PROPERTY("ActiveProfile", "s", answerProfile, 0, SD_BUS_VTABLE_PROPERTY_EMITS_CHANGE),
    SD_BUS_VTABLE_END,
}};

// Imitates the power-profiles service. The test's own thread runs it while it waits.
class FakeService {
 public:
  FakeService(const std::string& address, std::string profile) : profile_(std::move(profile)) {
    EXPECT_GE(sd_bus_new(&bus_), 0);
    EXPECT_GE(sd_bus_set_address(bus_, address.c_str()), 0);
    EXPECT_GE(sd_bus_set_bus_client(bus_, 1), 0);
    EXPECT_GE(sd_bus_start(bus_), 0);
    EXPECT_GE(sd_bus_add_object_vtable(bus_, nullptr, kPath, kName, kTable.data(), &profile_), 0);
    EXPECT_GE(sd_bus_request_name(bus_, kName, 0), 0);
  }
  FakeService(const FakeService&) = delete;
  FakeService& operator=(const FakeService&) = delete;
  ~FakeService() { sd_bus_flush_close_unref(bus_); }

  void choose(const std::string& profile) {
    profile_ = profile;
    EXPECT_GE(sd_bus_emit_properties_changed(bus_, kPath, kName, "ActiveProfile", nullptr), 0);
  }

  // Handles pending messages, or waits a short time for new ones.
  void serve() {
    while (sd_bus_process(bus_, nullptr) > 0) {
    }
    sd_bus_wait(bus_, 10'000);  // microseconds
  }

 private:
  sd_bus* bus_ = nullptr;
  std::string profile_;
};

// Collects a watcher's reports.
class Reports {
 public:
  void add(bool isPowerSaver) {
    const MutexLock lock(mutex_);
    reports_.push_back(isPowerSaver);
  }
  std::optional<bool> take() {
    const MutexLock lock(mutex_);
    if (reports_.empty()) return std::nullopt;
    const bool first = reports_.front();
    reports_.pop_front();
    return first;
  }

 private:
  Mutex mutex_;
  std::deque<bool> reports_ GUARDED_BY(mutex_);
};

class PowerProfileWatcherTest : public testing::Test {
 protected:
  void SetUp() override { ASSERT_TRUE(bus_.isRunning()) << "dbus-daemon does not run"; }

  // The watcher's next report; none if there is no report within ten seconds.
  std::optional<bool> nextReport(FakeService& service) {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    while (std::chrono::steady_clock::now() < end) {
      if (const auto report = reports_.take()) return report;
      service.serve();
    }
    return std::nullopt;
  }

  PrivateBus bus_;
  Reports reports_;
};

TEST_F(PowerProfileWatcherTest, ReportsThePresentProfileAndItsChanges) {
  FakeService service(bus_.address(), "power-saver");
  const PowerProfileWatcher watcher([this](bool isPowerSaver) { reports_.add(isPowerSaver); },
                                    bus_.address());
  EXPECT_EQ(nextReport(service), true);
  service.choose("balanced");
  EXPECT_EQ(nextReport(service), false);
  service.choose("performance");  // still not power-saver, so no report
  service.choose("power-saver");
  EXPECT_EQ(nextReport(service), true);
}

TEST_F(PowerProfileWatcherTest, NoticesAServiceThatStartsLaterAndOneThatEnds) {
  const PowerProfileWatcher watcher([this](bool isPowerSaver) { reports_.add(isPowerSaver); },
                                    bus_.address());
  {
    FakeService service(bus_.address(), "power-saver");
    EXPECT_EQ(nextReport(service), true);
  }
  FakeService other(bus_.address(), "balanced");
  EXPECT_EQ(nextReport(other), false);
}

TEST(PowerProfileWatcherWithoutBusTest, ReportsNothingAndEndsAtOnce) {
  const TemporaryDirectory directory;
  bool wasTold = false;
  {
    const PowerProfileWatcher watcher([&](bool) { wasTold = true; },
                                      "unix:path=" + directory.path("nowhere"));
  }
  EXPECT_FALSE(wasTold);
}

}  // namespace
}  // namespace tonewerk
