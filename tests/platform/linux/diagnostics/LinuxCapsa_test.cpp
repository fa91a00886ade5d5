// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/LinuxCapsa.h"

#include <atomic>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <limits>
#include <nlohmann/json.hpp>
#include <optional>
#include <thread>

#include "platform/Log.h"
#include "platform/linux/diagnostics/CapturePolicy.h"
#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/json/NlohmannJsonService.h"
#include "platform/linux/preferences/TomlPreferenceStore.h"
#include "platform/linux/threads/ThreadQueueFactory.h"
#include "support/TemporaryDirectory.h"
#include "support/manual/ManualClock.h"
#include "support/manual/ManualTimers.h"
#include "support/memory/MemoryLog.h"

namespace tonewerk {
namespace {

using nlohmann::json;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::SizeIs;

constexpr std::chrono::seconds kGenerous{30};

FaultsignSignature signatureOf(const std::string& type) {
  return {"AudioAnalytics", type, "Error", "IssueDetector", "player", std::nullopt};
}

// Tests the service with a state directory of its own.
class LinuxCapsaTest : public testing::Test {
 protected:
  struct Answer {
    bool isAccepted = false;
    std::vector<ValueMap> replies;

    std::string identifier() const { return replies.at(0).text(kFaultsignReplySessionID); }
    std::int64_t reason() const {
      return replies.at(0).boolean(kFaultsignReplySuccess) ? -1
                                                           : replies.at(0).integer(kFaultsignReplyReason);
    }
  };

  LinuxCapsaTest() { begin(); }

  // Restarts the daemon.
  void begin() {
    end();
    preferences.emplace(directory.path("etc"), directory.path("state/preferences"), category);
    store.emplace(directory.path("state"), std::vector<std::shared_ptr<DiagnosticCollector>>{}, jsonService,
                  *preferences, clock, category, DiagnosticsStore::Limits{});
    capsa.emplace(*store, *preferences, queues, timers, clock, category);
    reporter = capsa->makeReporter();
  }
  void end() {
    if (capsa) capsa->finish();
    if (store) store->finish(kGenerous);
    capsa.reset();
    store.reset();
  }

  Answer snapshot(const FaultsignSignature& signature, double duration = 0.0,
                  const std::optional<ValueMap>& payload = {}) {
    Answer answer;
    answer.isAccepted = reporter->snapshotWithSignature(
        signature, duration, std::nullopt, payload,
        [&answer](const std::optional<ValueMap>& reply) { answer.replies.push_back(reply.value()); });
    return answer;
  }
  Answer start(const FaultsignSignature& signature, double duration) {
    Answer answer;
    answer.isAccepted = reporter->startSessionWithSignature(
        signature, duration, std::nullopt, std::nullopt, std::nullopt,
        [&answer](const std::optional<ValueMap>& reply) { answer.replies.push_back(reply.value()); });
    return answer;
  }

  // The folders of captures. After end(), all requested captures have been written.
  std::vector<std::string> folders() const {
    std::vector<std::string> names;
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator(directory.path("state/captures"), error)) {
      names.push_back(entry.path().filename());
    }
    return names;
  }
  json requestIn(const std::string& folder) const {
    std::ifstream file(directory.path("state/captures/" + folder + "/request.json"));
    return json::parse(file, nullptr, false);
  }

  TemporaryDirectory directory;
  ManualClock clock;
  ManualTimers timers{clock};
  MemoryLog log;
  const LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  NlohmannJsonService jsonService;
  ThreadQueueFactory queues;
  std::optional<TomlPreferenceStore> preferences;
  std::optional<DiagnosticsStore> store;
  std::optional<LinuxCapsa> capsa;
  std::unique_ptr<FaultsignReporter> reporter;
};

TEST_F(LinuxCapsaTest, AnImmediateCaptureLeavesAFolderUnderItsSessionIdentifier) {
  const Answer answer =
      snapshot(signatureOf("haptics"), 0.0,
               ValueMap{{kFaultsignKeyPayloadDEParameters, ValueMap{{"processIDs", ValueArray{4711}}}}});
  EXPECT_TRUE(answer.isAccepted);
  ASSERT_THAT(answer.replies, SizeIs(1));  // before the call returned
  EXPECT_TRUE(answer.replies[0].boolean(kFaultsignReplySuccess));
  EXPECT_FALSE(answer.replies[0].contains(kFaultsignReplyReason));
  end();
  EXPECT_THAT(folders(), ElementsAre(answer.identifier()));
  const json request = requestIn(answer.identifier());
  EXPECT_EQ(request["signature"], json::parse(R"({"domain": "AudioAnalytics", "type": "haptics",
      "subType": "Error", "subtypeContext": "IssueDetector", "detectedProcess": "player"})"));
  EXPECT_EQ(request["duration"], 0.0);
  EXPECT_EQ(request["payload"],
            json::parse(R"({"kFaultsignKeyPayloadDEParameters": {"processIDs": [4711]}})"));
}

TEST_F(LinuxCapsaTest, MissingValuesOfARequestAreNotInItsFile) {
  const Answer answer = snapshot({"a", "b", "c", "d", std::nullopt, ValueMap{{"level", 1}}});
  end();
  const json request = requestIn(answer.identifier());
  EXPECT_EQ(request["signature"].size(), 4U);
  EXPECT_FALSE(request.contains("payload"));
}

TEST_F(LinuxCapsaTest, ACaptureWithADurationIsMadeAfterIt) {
  const Answer answer = start(signatureOf("alarms"), 60.0);
  EXPECT_TRUE(answer.isAccepted);
  ASSERT_THAT(answer.replies, SizeIs(1));
  clock.advance(60.0);
  end();
  EXPECT_THAT(folders(), ElementsAre(answer.identifier()));
  EXPECT_EQ(requestIn(answer.identifier())["duration"], 60.0);
  EXPECT_THAT(log.textsOf("twrs"), Not(Contains(HasSubstr("dropped"))));
}

TEST_F(LinuxCapsaTest, ACancelledCaptureIsNotMade) {
  const Answer answer = start(signatureOf("alarms"), 60.0);
  reporter->cancelSession(answer.identifier());
  clock.advance(60.0);
  end();
  EXPECT_THAT(folders(), IsEmpty());
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kInfo),
              Contains("capture cancelled. sessionId=" + answer.identifier()));
}

TEST_F(LinuxCapsaTest, AnotherReporterMayCancel) {
  const Answer answer = start(signatureOf("alarms"), 60.0);
  reporter.reset();  // does not cancel it
  capsa->makeReporter()->cancelSession(answer.identifier());
  clock.advance(60.0);
  end();
  EXPECT_THAT(folders(), IsEmpty());
}

TEST_F(LinuxCapsaTest, CancellingAnUnknownSessionSaysThatThereIsNone) {
  reporter->cancelSession("NONE_RETURNED");
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kInfo),
              Contains("no capture to cancel: kFaultsignErrorSessionNotFound. sessionId=NONE_RETURNED"));
}

TEST_F(LinuxCapsaTest, PendingCapturesAreDroppedAtTheEndWithALogLine) {
  const Answer answer = start(signatureOf("alarms"), 60.0);
  end();
  clock.advance(60.0);
  EXPECT_THAT(folders(), IsEmpty());
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kDefault),
              ElementsAre("captures dropped that were still pending: (" + answer.identifier() + ")"));
}

TEST_F(LinuxCapsaTest, InvalidParametersAreNotAcceptedAndAnsweredWithTheirReason) {
  for (const double duration : {-1.0, std::numeric_limits<double>::quiet_NaN()}) {
    const Answer answer = start(signatureOf("alarms"), duration);
    EXPECT_FALSE(answer.isAccepted);
    EXPECT_EQ(answer.reason(), kFaultsignErrorInvalidParameters);
  }
  const Answer answer = snapshot({});
  EXPECT_FALSE(answer.isAccepted);
  EXPECT_EQ(answer.reason(), kFaultsignErrorInvalidParameters);
  EXPECT_FALSE(answer.replies[0].contains(kFaultsignReplySessionID));
}

TEST_F(LinuxCapsaTest, TheSameSignatureIsThrottled) {
  snapshot(signatureOf("haptics"));
  const Answer answer = snapshot(signatureOf("haptics"));
  EXPECT_TRUE(answer.isAccepted);
  EXPECT_EQ(answer.reason(), kFaultsignErrorRequestThrottled);
}

TEST_F(LinuxCapsaTest, TheDaysCapturesAreCountedAcrossRestarts) {
  for (int n = 0; n < CapturePolicy::kMaxPerDay; ++n) {
    if (n == 7) begin();
    EXPECT_EQ(start(signatureOf(std::to_string(n)), 1.0).reason(), -1) << n;
    clock.advance(1.0);  // so that no capture stays pending
  }
  begin();
  const Answer answer = snapshot(signatureOf("another"));
  EXPECT_TRUE(answer.isAccepted);
  EXPECT_EQ(answer.reason(), kFaultsignErrorDailyLimitExceeded);
  EXPECT_EQ(preferences->read("com.orvane.tonewerk.captures", "accepted"),
            Value(ValueMap{{"day", "2025-11-20"}, {"count", 20}}));

  clock.advance(86'400.0);
  begin();
  EXPECT_EQ(snapshot(signatureOf("another")).reason(), -1);
  end();
  EXPECT_EQ(preferences->read("com.orvane.tonewerk.captures", "accepted"),
            Value(ValueMap{{"day", "2025-11-21"}, {"count", 1}}));
}

TEST_F(LinuxCapsaTest, AnInvalidCountIsIgnored) {
  for (const Value& spoilt : {Value("many"), Value(ValueMap{{"day", "2025-11-20"}}),
                              Value(ValueMap{{"day", "2025-11-20"}, {"count", -7}})}) {
    ASSERT_FALSE(preferences->write("com.orvane.tonewerk.captures", "accepted", spoilt));
    begin();
    EXPECT_EQ(snapshot(signatureOf("haptics")).reason(), -1) << spoilt.text();
    end();
    EXPECT_EQ(preferences->read("com.orvane.tonewerk.captures", "accepted"),
              Value(ValueMap{{"day", "2025-11-20"}, {"count", 1}}));
  }
}

TEST_F(LinuxCapsaTest, ACountThatCannotBeKeptIsLoggedAndStopsNothing) {
  std::filesystem::create_directories(directory.path("state"));
  std::ofstream(directory.path("state/preferences")) << "in the way";
  EXPECT_EQ(snapshot(signatureOf("haptics")).reason(), -1);
  end();
  EXPECT_THAT(folders(), SizeIs(1));
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError),
              Contains(HasSubstr("cannot keep how many captures the day has seen: ")));
}

TEST_F(LinuxCapsaTest, NoTextOfASignatureLeadsOutOfTheDirectory) {
  const Answer answer = snapshot({"../../a", "../b", "/etc", "..", "../../../passwd", std::nullopt});
  end();
  EXPECT_THAT(folders(), ElementsAre(answer.identifier()));
  EXPECT_THAT(answer.identifier(), SizeIs(26));
  EXPECT_EQ(requestIn(answer.identifier())["signature"]["detectedProcess"], "../../../passwd");
}

TEST_F(LinuxCapsaTest, WhileTheStoreIsFullCapturesAreUnavailable) {
  end();
  DiagnosticsStore::Limits limits;
  limits.pendingItems = 0;
  store.emplace(directory.path("state"), std::vector<std::shared_ptr<DiagnosticCollector>>{}, jsonService,
                *preferences, clock, category, limits);
  capsa.emplace(*store, *preferences, queues, timers, clock, category);
  reporter = capsa->makeReporter();
  const Answer answer = snapshot(signatureOf("haptics"));
  EXPECT_TRUE(answer.isAccepted);
  EXPECT_EQ(answer.reason(), kFaultsignErrorServiceUnavailable);
  EXPECT_THAT(log.textsOf("twrs", LogLevel::kError), Contains(HasSubstr("capture not made. sessionId=")));
}

TEST_F(LinuxCapsaTest, AReporterThatOutlivesTheServiceRefusesEverything) {
  const std::string identifier = start(signatureOf("alarms"), 60.0).identifier();
  end();
  EXPECT_EQ(snapshot(signatureOf("haptics")).reason(), kFaultsignErrorServiceUnavailable);
  EXPECT_EQ(start(signatureOf("haptics"), 1.0).reason(), kFaultsignErrorServiceUnavailable);
  reporter->cancelSession(identifier);
  EXPECT_THAT(folders(), IsEmpty());
}

TEST_F(LinuxCapsaTest, ARequestWithoutAReplyHandlerIsServed) {
  EXPECT_TRUE(reporter->snapshotWithSignature(signatureOf("a"), 0.0, std::nullopt, std::nullopt, nullptr));
  end();
  EXPECT_THAT(folders(), SizeIs(1));
}

TEST_F(LinuxCapsaTest, ConcurrentRequestsDoNotExceedTheDailyLimit) {
  std::atomic<int> started = 0;
  const auto ask = [&](const std::string& name) {
    const auto own = capsa->makeReporter();
    for (int n = 0; n < 15; ++n) {
      const bool isAccepted =
          own->startSessionWithSignature(signatureOf(name + std::to_string(n)), 3600.0, {}, {}, {},
                                         [&](const std::optional<ValueMap>& reply) {
                                           if (!reply->boolean(kFaultsignReplySuccess)) return;
                                           ++started;
                                           own->cancelSession(reply->text(kFaultsignReplySessionID));
                                         });
      EXPECT_TRUE(isAccepted);
    }
  };
  std::thread one([&] { ask("one"); });
  std::thread other([&] { ask("other"); });
  one.join();
  other.join();
  EXPECT_EQ(started, CapturePolicy::kMaxPerDay);
  end();
  EXPECT_EQ(preferences->read("com.orvane.tonewerk.captures", "accepted"),
            Value(ValueMap{{"day", "2025-11-20"}, {"count", 20}}));
}

}  // namespace
}  // namespace tonewerk
