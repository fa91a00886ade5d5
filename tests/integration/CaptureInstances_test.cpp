// SPDX-License-Identifier: Apache-2.0
//
// Tests what the capture worker's instances write to the disk with the real capture service.
#include <filesystem>
#include <functional>
#include <gmock/gmock.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/diagnostics/DiagnosticsDirectory.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/LinuxCapsa.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/threads/ThreadQueueFactory.h"
#include "support/TemporaryDirectory.h"
#include "workers/diagnostics/CapsaTest.h"
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceAlarmLowRMS.h"
#include "workers/diagnostics/TWReportingCapsaWorkerInstanceHapticLeaks.h"

namespace tonewerk {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr std::chrono::seconds kTimeout{30};

class CaptureInstancesTest : public CapsaTest {
 protected:
  // Instances are used on the work queue.
  void onWorkQueue(std::function<void()> work) {
    context->reportingServerQueue().async(std::move(work));
    test.queues.runAll();
  }
  // Does what the worker does when an instance has seen its symptom often and long enough.
  void fire(TWReportingSessionCapsaWorkerInstance& instance, AudioEventCategory category,
            AudioEventType type) {
    onWorkQueue([&] {
      instance.workerState().symptomReporter = capsa.makeReporter();
      instance.fire(TWReportingSessionMessage({{"n", 1}}, category, type));
    });
  }
  // Ends the services and returns the captures on the disk.
  std::vector<std::string> captures() {
    capsa.finish();
    store.finish(kTimeout);
    std::vector<std::string> names;
    for (const auto& entry : items.list(DiagnosticKind::kCapture)) names.push_back(entry.name);
    return names;
  }
  ValueMap request(const std::string& name) {
    std::string problem;
    const std::string text =
        items.readFile(DiagnosticKind::kCapture, name, "request.json").value_or("no file");
    const std::optional<Value> value = json.parse(text, problem);
    EXPECT_TRUE(value && value->asMap() != nullptr) << problem;
    return value && value->asMap() != nullptr ? *value->asMap() : ValueMap();
  }

  TemporaryDirectory directory;
  const DiagnosticsDirectory items{directory.path()};
  std::shared_ptr<TWReportingSession> session = makeSessionOf(kServiceAlarms);
  const LogCategory adapters{test.log, "com.orvane.tonewerk", "twrs"};
  NlohmannJsonService json;
  ThreadQueueFactory queues;
  DiagnosticsStore store{directory.path(), {}, json, test.preferences, test.clock, adapters, {}};
  LinuxCapsa capsa{store, test.preferences, queues, test.timers, test.clock, adapters};
};

TEST_F(CaptureInstancesTest, AHapticLeakIsCapturedUnderTheIdentifierThatItsStateKeeps) {
  TWReportingCapsaWorkerInstanceHapticLeaks instance(session);
  fire(instance, kCategoryGeneric, kTypeEnergybook);
  const std::string identifier = instance.workerState().currentCapsaSessionIdentifier.value_or("none");
  EXPECT_THAT(infos(), Contains("Started Capsa session. sessionId=" + identifier));
  EXPECT_THAT(captures(), ElementsAre(identifier));
  const ValueMap found = request(identifier);
  EXPECT_EQ(textOf(found.find("signature")),
            R"({"domain":"AudioAnalytics","type":"alarms","subType":"Generic",)"
            R"("subtypeContext":"Energybook","detectedProcess":"player"})");
  EXPECT_EQ(found.number("duration"), 0.0);
  EXPECT_EQ(textOf(found.find("payload")),
            R"({"kFaultsignKeyPayloadDEParameters":)"
            R"({"com.orvane.EnergybookCore.DESysLogFilterProcess":{"processIDs":[4711,12]}}})");
}

TEST_F(CaptureInstancesTest, AQuietAlarmWhoseSessionOutlivesTheMinuteIsCaptured) {
  TWReportingCapsaWorkerInstanceAlarmLowRMS instance(session);
  fire(instance, kCategoryError, kTypeIssueDetector);
  const std::string identifier = instance.workerState().currentCapsaSessionIdentifier.value_or("none");
  test.clock.advance(60.0);
  onWorkQueue([&] { instance.stop(); });  // too late
  EXPECT_THAT(captures(), ElementsAre(identifier));
  EXPECT_EQ(request(identifier).number("duration"), 60.0);
}

TEST_F(CaptureInstancesTest, AQuietAlarmWhoseSessionEndsWithinTheMinuteIsNotCaptured) {
  TWReportingCapsaWorkerInstanceAlarmLowRMS instance(session);
  fire(instance, kCategoryError, kTypeIssueDetector);
  test.clock.advance(59.0);
  onWorkQueue([&] { instance.stop(); });
  test.clock.advance(600.0);
  EXPECT_THAT(captures(), IsEmpty());
}

TEST_F(CaptureInstancesTest, ARefusedCaptureLeavesNoneReturnedAndNothingToCancel) {
  TWReportingCapsaWorkerInstanceAlarmLowRMS first(session);
  TWReportingCapsaWorkerInstanceAlarmLowRMS second(session);
  fire(first, kCategoryError, kTypeIssueDetector);
  fire(second, kCategoryError, kTypeIssueDetector);
  EXPECT_EQ(second.workerState().currentCapsaSessionIdentifier, "NONE_RETURNED");
  EXPECT_THAT(infos(), Contains("Failed starting capsa session. reason=kFaultsignErrorRequestThrottled"));
  onWorkQueue([&] { second.stop(); });  // does not cancel the first one's capture
  test.clock.advance(60.0);
  EXPECT_THAT(captures(), ElementsAre(first.workerState().currentCapsaSessionIdentifier.value_or("none")));
}

}  // namespace
}  // namespace tonewerk
