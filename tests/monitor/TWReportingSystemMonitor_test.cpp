// SPDX-License-Identifier: Apache-2.0
#include "monitor/TWReportingSystemMonitor.h"

#include <atomic>
#include <gmock/gmock.h>
#include <string>
#include <thread>
#include <vector>

#include "session/TWReportingUtility.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kSuite[] = "com.orvane.tonewerk";
constexpr char kHomedeck[] = "com.orvane.homedeck";
constexpr char kAccessory[] = "spatial-audio-accessory-feature";
constexpr char kAccessoryChanged[] = "com.orvane.homedeck.spatial-audio-accessory-feature.changed";
constexpr char kReporting[] = "com.orvane.tonewerk.reporting";
constexpr char kRinger[] = "com.orvane.homedeck.ringerstate";

class SystemMonitorTest : public ReportingTest {
 protected:
  SystemMonitorTest() { test.system.setUptime(100.0); }

  SerialQueue& queue() { return TWReportingUtilityGetReportingServerQueue(); }
  void initialize() { TWReportingSystemMonitor::initializeWithQueue(queue()); }
  void run() { test.queues.runAll(); }
  static std::shared_ptr<ObservableMap> map() {
    return TWReportingSystemMonitor::getSystemMonitorDictionary();
  }
  void post(const std::string& name, std::uint64_t state) {
    EXPECT_FALSE(test.notifications.post(name, state));
    run();
  }
  void write(const char* domain, const char* key, const Value& value) {
    EXPECT_FALSE(test.preferences.write(domain, key, value));
  }
  std::vector<std::string> texts(LogLevel level) { return test.log.textsOf("twrs", level); }

  ValueMap state(const char* name, const Value& value, int uptime = 100) const {
    return {{name, value}, {"twreporting_timestamp", test.clock.now()}, {"systemuptime_sec", uptime}};
  }
};

TEST_F(SystemMonitorTest, WithoutAMonitorTheDictionaryIsNullAndThereAreNoKeys) {
  EXPECT_EQ(map(), nullptr);
  EXPECT_THAT(TWReportingSystemMonitor::getSystemMonitorKeys(), IsEmpty());
  TWReportingSystemMonitor::reset();
  EXPECT_EQ(map(), nullptr);
}

TEST_F(SystemMonitorTest, TheKeysAreTheFeaturesInTheTablesOrder) {
  initialize();
  EXPECT_THAT(TWReportingSystemMonitor::getSystemMonitorKeys(),
              ElementsAre(kAccessory, "device_name", "ringerstate"));
}

TEST_F(SystemMonitorTest, TheFeaturesAreTheDictionaryAndTheKeys) {
  EXPECT_EQ(TWReportingSystemMonitor::getFeatures().states, nullptr);
  EXPECT_EQ(TWReportingSystemMonitor::getFeatures().names, nullptr);
  initialize();
  const auto features = TWReportingSystemMonitor::getFeatures();
  EXPECT_EQ(features.states, map());
  EXPECT_THAT(*features.names, ElementsAre(kAccessory, "device_name", "ringerstate"));
}

TEST_F(SystemMonitorTest, InitializingTwiceKeepsTheFirstMonitorAndItsQueue) {
  initialize();
  const auto first = map();
  ManualSerialQueue other("other");
  test.log.clear();
  TWReportingSystemMonitor::initializeWithQueue(other);
  EXPECT_EQ(map(), first);
  EXPECT_THAT(test.log.lines(), IsEmpty());
  EXPECT_FALSE(test.notifications.post(kRinger, 1));
  EXPECT_EQ(other.pendingCount(), 0U);
  run();
  EXPECT_EQ(first->find("ringerstate"), state("ringerstate", true));
}

TEST_F(SystemMonitorTest, ReadsThePreferencesWhenItIsMade) {
  write(kHomedeck, kAccessory, 3);
  write(kSuite, "device_name", "Kitchen");
  test.system.setUptime(99.5);
  initialize();
  EXPECT_EQ(map()->find(kAccessory), state(kAccessory, 3));
  EXPECT_EQ(map()->find("device_name"), state("device_name", "Kitchen"));
}

TEST_F(SystemMonitorTest, AValueIsKeptUnchanged) {
  write(kSuite, "device_name", ValueArray{1, "two"});
  write(kHomedeck, kAccessory, false);
  initialize();
  EXPECT_EQ(map()->find("device_name"), state("device_name", ValueArray{1, "two"}));
  EXPECT_EQ(map()->find(kAccessory)->find(kAccessory)->kind(), Value::Kind::kBoolean);
}

TEST_F(SystemMonitorTest, TheTimesAreADoubleAndA32BitInteger) {
  write(kSuite, "device_name", "Kitchen");
  test.clock.setNow(1'763'633'880.5);
  test.system.setUptime(100.49);
  initialize();
  const ValueMap held = *map()->find("device_name");
  EXPECT_EQ(held.find("twreporting_timestamp")->kind(), Value::Kind::kDouble);
  EXPECT_EQ(held.number("twreporting_timestamp"), 1'763'633'880.5);
  EXPECT_EQ(held.find("systemuptime_sec")->kind(), Value(1).kind());
  EXPECT_EQ(held.integer("systemuptime_sec"), 100);
}

TEST_F(SystemMonitorTest, AFeatureThatWasNeverReadableHasNoEntry) {
  write(kHomedeck, "device_name", "in the wrong domain");
  initialize();
  for (const std::string& key : TWReportingSystemMonitor::getSystemMonitorKeys()) {
    EXPECT_EQ(map()->find(key), std::nullopt) << key;
  }
}

// The monitor reads the ringer only after a notification, also when its state was posted before.
TEST_F(SystemMonitorTest, TheRingerHasNoEntryBeforeItsFirstNotification) {
  EXPECT_FALSE(test.notifications.post(kRinger, 1));
  initialize();
  EXPECT_EQ(map()->find("ringerstate"), std::nullopt);
  EXPECT_FALSE(test.notifications.post(kRinger));
  run();
  EXPECT_EQ(map()->find("ringerstate"), state("ringerstate", true));
}

TEST_F(SystemMonitorTest, ARingerNotificationWhoseStateReads2StoresFalse) {
  initialize();
  post(kRinger, 2);
  EXPECT_EQ(map()->find("ringerstate"), state("ringerstate", false));
  EXPECT_EQ(map()->find("ringerstate")->find("ringerstate")->kind(), Value::Kind::kBoolean);
}

TEST_F(SystemMonitorTest, TheRingerIsOnOnlyInState1) {
  initialize();
  for (const auto& [posted, expected] : std::vector<std::pair<std::uint64_t, bool>>{
           {1, true}, {0, false}, {0x1'0000'0001, false}, {1, true}, {UINT64_MAX, false}}) {
    post(kRinger, posted);
    EXPECT_EQ(map()->find("ringerstate"), state("ringerstate", expected)) << posted;
  }
}

TEST_F(SystemMonitorTest, AnUnreadableStateKeepsTheLastKnownState) {
  initialize();
  post(kRinger, 1);
  const auto before = map()->find("ringerstate");
  test.notifications.makeUnreadable(kRinger);
  test.clock.advance(5.0);
  EXPECT_FALSE(test.notifications.post(kRinger));
  run();
  EXPECT_EQ(map()->find("ringerstate"), before);
}

TEST_F(SystemMonitorTest, ANotificationMakesItReadThePreferenceAgain) {
  initialize();
  write(kSuite, "device_name", "Kitchen");
  write(kHomedeck, kAccessory, true);
  EXPECT_FALSE(test.notifications.post(kReporting));
  run();
  EXPECT_EQ(map()->find("device_name"), state("device_name", "Kitchen"));
  EXPECT_EQ(map()->find(kAccessory), std::nullopt);
  EXPECT_FALSE(test.notifications.post(kAccessoryChanged));
  run();
  EXPECT_EQ(map()->find(kAccessory), state(kAccessory, true));
}

TEST_F(SystemMonitorTest, ARemovedPreferenceKeepsTheLastKnownState) {
  write(kSuite, "device_name", "Kitchen");
  initialize();
  const auto before = map()->find("device_name");
  EXPECT_FALSE(test.preferences.remove(kSuite, "device_name"));
  test.clock.advance(5.0);
  EXPECT_FALSE(test.notifications.post(kReporting));
  run();
  EXPECT_EQ(map()->find("device_name"), before);
}

TEST_F(SystemMonitorTest, TwoNotificationsWithTheSameValueReadAtDifferentTimesNotifyTwice) {
  write(kSuite, "device_name", "Kitchen");
  initialize();
  std::vector<ValueMap> notified;
  const auto observation = ObservableMap::observe(
      map(), "device_name", [&](std::string_view key) { notified.push_back(*map()->find(key)); });
  EXPECT_FALSE(test.notifications.post(kReporting));  // at the same time as the first read
  run();
  EXPECT_THAT(notified, IsEmpty());
  test.clock.advance(1.0);
  EXPECT_FALSE(test.notifications.post(kReporting));
  run();
  const ValueMap second = state("device_name", "Kitchen");
  test.system.setUptime(101.0);  // the other of the two times that a read records
  EXPECT_FALSE(test.notifications.post(kReporting));
  run();
  EXPECT_THAT(notified, ElementsAre(second, state("device_name", "Kitchen", 101)));
}

TEST_F(SystemMonitorTest, HandlersAndObserversRunOnTheQueue) {
  initialize();
  bool onQueue = false;
  const auto observation =
      ObservableMap::observe(map(), "ringerstate", [&](std::string_view) { onQueue = queue().isCurrent(); });
  EXPECT_FALSE(test.notifications.post(kRinger, 1));
  EXPECT_EQ(map()->find("ringerstate"), std::nullopt);
  run();
  EXPECT_TRUE(onQueue);
}

TEST_F(SystemMonitorTest, ObserversRunWhileTheMapsLockIsHeld) {
  initialize();
  std::thread other;
  std::atomic<bool> hasStarted = false;
  bool isDone = false;  // need not be atomic, because the lock orders the accesses
  const auto held = map();
  const auto observation = ObservableMap::observe(held, "ringerstate", [&](std::string_view) {
    other = std::thread([&] {
      hasStarted = true;
      hasStarted.notify_all();
      EXPECT_NE(held->find("ringerstate"), std::nullopt);
      EXPECT_TRUE(isDone);
    });
    hasStarted.wait(false);
    isDone = true;
  });
  post(kRinger, 1);
  ASSERT_TRUE(other.joinable());
  other.join();
}

TEST_F(SystemMonitorTest, ARegistrationThatFailsIsLoggedAndItsFeatureKept) {
  test.notifications.failRegistrations(NotificationService::kStatusFailed);
  write(kSuite, "device_name", "Kitchen");
  initialize();
  EXPECT_THAT(texts(LogLevel::kDefault),
              ElementsAre("getting feature spatial-audio-accessory-feature", "getting feature device_name",
                          "getting feature ringerstate", "notify setup result 1000000 token -1",
                          "notify setup result 1000000 token -1", "notify setup result 1000000 token -1"));
  EXPECT_THAT(TWReportingSystemMonitor::getSystemMonitorKeys(),
              ElementsAre(kAccessory, "device_name", "ringerstate"));
  EXPECT_EQ(map()->find("device_name"), state("device_name", "Kitchen"));
  const auto monitor = TWReportingSystemMonitor::initWithQueue(queue());
  EXPECT_EQ(monitor->getFeatureState("ringerstate"), std::nullopt);
}

TEST_F(SystemMonitorTest, LogsItsStepsWhenItIsMade) {
  initialize();
  constexpr char kTable[] =
      R"({"spatial-audio-accessory-feature":{"defaults_domain":"com.orvane.homedeck",)"
      R"("feature_domain":"spatial-audio-accessory-feature",)"
      R"("notification":"com.orvane.homedeck.spatial-audio-accessory-feature.changed"},)"
      R"("device_name":{"defaults_domain":"com.orvane.tonewerk","feature_domain":"device_name",)"
      R"("notification":"com.orvane.tonewerk.reporting"},)"
      R"("ringerstate":{"feature_domain":"ringerstate","notification":"com.orvane.homedeck.ringerstate"}})";
  EXPECT_THAT(test.log.textsOf("twrs"),
              ElementsAre(std::string("populateInitialValues ") + kTable,
                          "getting feature spatial-audio-accessory-feature", "getting feature device_name",
                          "getting feature ringerstate", std::string("listening for features ") + kTable,
                          "notify setup result 0 token 1", "notify setup result 0 token 2",
                          "notify setup result 0 token 3"));
  EXPECT_EQ(texts(LogLevel::kInfo).size(), 2U);
  EXPECT_EQ(texts(LogLevel::kDefault).size(), 6U);
}

TEST_F(SystemMonitorTest, LogsWhichFeatureChanged) {
  initialize();
  test.log.clear();
  post(kRinger, 1);
  EXPECT_THAT(texts(LogLevel::kInfo), ElementsAre("feature changes featureName=ringerstate token=3"));
  EXPECT_THAT(texts(LogLevel::kDefault), ElementsAre("getting feature ringerstate"));
  EXPECT_THAT(test.log.lines(), ::testing::SizeIs(2));
}

TEST_F(SystemMonitorTest, AnUnknownFeatureHasNoState) {
  const auto monitor = TWReportingSystemMonitor::initWithQueue(queue());
  EXPECT_EQ(monitor->getFeatureState("volume"), std::nullopt);
  EXPECT_EQ(monitor->getFeatureState(""), std::nullopt);
  EXPECT_EQ(texts(LogLevel::kDefault).back(), "getting feature ");
}

TEST_F(SystemMonitorTest, ResetEndsTheRegistrationsAndDropsTheMonitor) {
  initialize();
  EXPECT_THAT(test.notifications.registered(), ElementsAre(kAccessoryChanged, kReporting, kRinger));
  const auto held = map();
  EXPECT_FALSE(test.notifications.post(kRinger, 1));  // its handler is queued already
  TWReportingSystemMonitor::reset();
  EXPECT_THAT(test.notifications.registered(), IsEmpty());
  run();
  EXPECT_EQ(map(), nullptr);
  EXPECT_EQ(held->find("ringerstate"), std::nullopt);
}

TEST_F(SystemMonitorTest, AfterResetTheNextMonitorStartsWithoutState) {
  initialize();
  post(kRinger, 1);
  const auto first = map();
  TWReportingSystemMonitor::reset();
  initialize();
  EXPECT_NE(map(), first);
  EXPECT_EQ(map()->find("ringerstate"), std::nullopt);
  post(kRinger, 1);
  EXPECT_NE(map()->find("ringerstate"), std::nullopt);
}

TEST_F(SystemMonitorTest, DestroyingAMonitorEndsItsRegistrations) {
  auto monitor = TWReportingSystemMonitor::initWithQueue(queue());
  EXPECT_EQ(test.notifications.registered().size(), 3U);
  monitor.reset();
  EXPECT_THAT(test.notifications.registered(), IsEmpty());
}

TEST_F(SystemMonitorTest, TheDefaultsSayThatReportingIsNotDisabledWhenNothingIsSet) {
  const ValueMap defaults = TWReportingSystemMonitor::TWReportingDefaults();
  EXPECT_EQ(defaults, (ValueMap{{"disable_reporting", 0}}));
  EXPECT_EQ(defaults.find("disable_reporting")->kind(), Value(0).kind());
}

TEST_F(SystemMonitorTest, TheDefaultsAreATextAndABoolean) {
  write(kSuite, "device_name", 5);
  write(kSuite, "disable_reporting", "yes");
  write(kSuite, "something_else", 1);
  const ValueMap defaults = TWReportingSystemMonitor::TWReportingDefaults();
  EXPECT_EQ(defaults, (ValueMap{{"device_name", "5"}, {"disable_reporting", true}}));
  EXPECT_EQ(defaults.find("disable_reporting")->kind(), Value::Kind::kBoolean);
}

TEST_F(SystemMonitorTest, TheDefaultsAreReadOnce) {
  write(kSuite, "device_name", "Kitchen");
  const auto monitor = TWReportingSystemMonitor::initWithQueue(queue());
  write(kSuite, "device_name", "Bath");
  EXPECT_EQ(monitor->getDefaults().text("device_name"), "Kitchen");
}

}  // namespace
}  // namespace tonewerk
