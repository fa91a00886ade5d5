// SPDX-License-Identifier: Apache-2.0
//
// Tests the whole service with the real capture service: which captures are made in a day when clients'
// sessions show symptoms, one after the other and at the same time.
#include <algorithm>
#include <gmock/gmock.h>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/LinuxCapsa.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/threads/ThreadQueueFactory.h"
#include "support/ServiceTest.h"
#include "support/TemporaryDirectory.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::UnorderedElementsAre;

constexpr std::chrono::seconds kTimeout{30};
constexpr AudioServiceType kLongFormAudio = 7;
constexpr char kThrottled[] = "Failed starting capsa session. reason=kFaultsignErrorRequestThrottled";
constexpr char kLimit[] = "Failed starting capsa session. reason=kFaultsignErrorDailyLimitExceeded";

class CaptureSourcesTest : public ServiceTest {
 protected:
  CaptureSourcesTest() {
    makeInternalBuild();
    test.deviceFacts.set("HapticLeakCapture", true);
    begin();
  }
  ~CaptureSourcesTest() override { end(); }

  // Begins a daemon. A second call ends the first daemon and begins one with the same directories.
  void begin() {
    end();
    store.emplace(directory.path(), std::vector<std::shared_ptr<DiagnosticCollector>>{}, json,
                  test.preferences, test.clock, adapters, DiagnosticsStore::Limits{});
    capsa.emplace(*store, test.preferences, queues, test.timers, test.clock, adapters);
    context.emplace(test.platformWith(*capsa), allWorkerClasses());
    startService();
  }
  // Ends the daemon in order: clients, sessions, captures.
  void end() {
    clients.clear();
    messaging.shutDown();
    run();
    service.reset();
    context.reset();
    if (capsa) capsa->finish();
    if (store) store->finish(kTimeout);
    capsa.reset();
    store.reset();
  }

  // A session that has a client of its own.
  struct Source {
    MemoryClient* client;
    ReporterID reporterID;
  };
  Source startSession(AudioServiceType serviceType) {
    const auto number = static_cast<std::int32_t>(++sources);
    clients.push_back(connect(100 + number));
    const Source source{clients.back().get(), number};
    create(*source.client, source.reporterID);
    ask(*source.client, "setServiceType", {serviceType, source.reporterID});
    source.client->request("startReportingSessionForID", {source.reporterID});
    run();
    return source;
  }
  void send(const Source& source, ValueMap payload, AudioEventCategory category, AudioEventType type) {
    payload.set("n", ++messages);  // so that no message is redundant
    ask(*source.client, "sendMessage", {payload, category, type, ValueArray{source.reporterID}});
  }
  void stop(const Source& source) { ask(*source.client, "stopReportingSessionForID", {source.reporterID}); }

  void reportLowRms(const Source& source) {
    send(source, {{"issue_type", "LowRMS"}}, kCategoryError, kTypeIssueDetector);
  }
  // Starts an alarm whose low volume is detected sixteen seconds after its start.
  Source quietAlarm() {
    const Source source = startSession(kServiceAlarms);
    reportLowRms(source);
    reportLowRms(source);
    test.clock.advance(16.0);
    reportLowRms(source);
    return source;
  }
  void leakHaptics(const Source& source) {
    send(source, {{"Haptic_Active_Hardware_Time_Seconds", 1}}, kCategoryGeneric, kTypeEnergybook);
  }

  std::vector<std::string> infos() const { return test.log.textsOf("twrb", LogLevel::kInfo); }
  std::size_t countOf(const std::string& line) const {
    const auto lines = infos();
    return static_cast<std::size_t>(std::count(lines.begin(), lines.end(), line));
  }
  // Ends the daemon and returns the services of the captures on the disk.
  std::vector<std::string> captured() {
    end();
    std::vector<std::string> services;
    for (const auto& entry : items.list(DiagnosticKind::kCapture)) {
      std::string problem;
      const auto text = items.readFile(DiagnosticKind::kCapture, entry.name, "request.json");
      const std::optional<Value> request = json.parse(text.value_or(""), problem);
      EXPECT_TRUE(request && request->asMap() != nullptr) << problem;
      const Value* signature = request && request->asMap() ? request->asMap()->find("signature") : nullptr;
      services.push_back(signature && signature->asMap() ? signature->asMap()->text("type") : "none");
    }
    return services;
  }

  TemporaryDirectory directory;
  const DiagnosticsDirectory items{directory.path()};
  const LogCategory adapters{test.log, "com.orvane.tonewerk", "twrs"};
  NlohmannJsonService json;
  ThreadQueueFactory queues;
  std::optional<DiagnosticsStore> store;
  std::optional<LinuxCapsa> capsa;
  std::vector<std::unique_ptr<MemoryClient>> clients;
  int sources = 0;
  int messages = 0;
};

TEST_F(CaptureSourcesTest, AnAlarmThatLastsLongerThanAMinuteIsCaptured) {
  quietAlarm();
  test.clock.advance(60.0);
  run();
  EXPECT_THAT(captured(), ElementsAre("alarms"));
}

TEST_F(CaptureSourcesTest, OneOfSeveralSourcesIsCancelledAndTheOthersAreCaptured) {
  const Source music = startSession(kLongFormAudio);
  leakHaptics(music);
  const Source heard = quietAlarm();
  test.clock.advance(10.0);
  stop(heard);  // cancels its capture
  quietAlarm();
  test.clock.advance(60.0);
  leakHaptics(music);
  run();
  EXPECT_THAT(captured(), UnorderedElementsAre("alarms", "longformaudio"));
}

// All sessions of one service and kind of message have one signature. A change of the service type has made
// these sessions, so they have no process name.
TEST_F(CaptureSourcesTest, ASecondAlarmWithinAMinuteOfAPendingOneIsThrottled) {
  quietAlarm();
  quietAlarm();  // sixteen seconds later
  EXPECT_THAT(infos(), Contains(kThrottled));
  test.clock.advance(600.0);
  run();
  EXPECT_THAT(captured(), ElementsAre("alarms"));
}

// Five minutes had to pass once, so that most alarms of an hour were not captured.
TEST_F(CaptureSourcesTest, AnAlarmAMinuteAfterAnotherIsCapturedToo) {
  quietAlarm();
  test.clock.advance(44.0);
  quietAlarm();  // 60 seconds after the first one
  test.clock.advance(60.0);
  run();
  EXPECT_THAT(infos(), Not(Contains(kThrottled)));
  EXPECT_THAT(captured(), ElementsAre("alarms", "alarms"));
}

// A cancelled capture once prevented the next alarm's capture.
TEST_F(CaptureSourcesTest, AnAlarmThatWasHeardDoesNotThrottleTheNext) {
  for (int n = 0; n < 3; ++n) stop(quietAlarm());
  quietAlarm();
  EXPECT_THAT(infos(), Not(Contains(kThrottled)));
  test.clock.advance(60.0);
  run();
  EXPECT_THAT(captured(), ElementsAre("alarms"));
}

TEST_F(CaptureSourcesTest, TwentyAlarmsADayAreCapturedAndTheNextOnesAreNot) {
  for (int n = 0; n < 22; ++n) {
    const Source alarm = quietAlarm();
    test.clock.advance(60.0);
    run();
    stop(alarm);
  }
  EXPECT_EQ(countOf(kThrottled), 0U);
  EXPECT_EQ(countOf(kLimit), 2U);
  EXPECT_THAT(captured(), SizeIs(20));
}

TEST_F(CaptureSourcesTest, TheCountOfTheDayContinuesAfterARestart) {
  const auto startAlarms = [this](int count) {
    for (int n = 0; n < count; ++n) {
      quietAlarm();
      test.clock.advance(60.0);
      run();
    }
  };
  startAlarms(12);
  begin();
  startAlarms(12);
  EXPECT_EQ(countOf(kLimit), 4U);
  EXPECT_THAT(captured(), SizeIs(20));
}

TEST_F(CaptureSourcesTest, CancelledCapturesCountForTheDayToo) {
  for (int n = 0; n < 20; ++n) stop(quietAlarm());
  quietAlarm();
  EXPECT_EQ(countOf(kLimit), 1U);
  test.clock.advance(60.0);
  run();
  EXPECT_THAT(captured(), IsEmpty());
}

TEST_F(CaptureSourcesTest, ARedundantLargeMessageDoesNotCountTowardsACapture) {
  const Source alarm = startSession(kServiceAlarms);
  const ValueMap large{{"issue_type", "LowRMS"},
                       {"samples", std::string(std::size_t{200} << 10, 'x')},
                       {"twreporting_timestamp", test.clock.now()}};
  for (int n = 0; n < 5; ++n) {
    ask(*alarm.client, "sendMessage",
        {large, kCategoryError, kTypeIssueDetector, ValueArray{alarm.reporterID}});
    test.clock.advance(10.0);
  }
  reportLowRms(alarm);  // the second message that differs
  test.clock.advance(600.0);
  run();
  EXPECT_THAT(captured(), IsEmpty());
}

}  // namespace
}  // namespace tonewerk
