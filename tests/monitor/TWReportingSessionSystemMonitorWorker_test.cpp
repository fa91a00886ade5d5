// SPDX-License-Identifier: Apache-2.0
#include "monitor/TWReportingSessionSystemMonitorWorker.h"

#include <functional>
#include <gmock/gmock.h>
#include <string>
#include <utility>
#include <vector>

#include "monitor/TWReportingSystemMonitor.h"
#include "session/TWReportingUtility.h"
#include "support/ReportingTest.h"

namespace tonewerk {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

using Worker = TWReportingSessionSystemMonitorWorker;

constexpr char kRinger[] = "com.orvane.homedeck.ringerstate";
constexpr char kReporting[] = "com.orvane.tonewerk.reporting";

// Passes each message to a function of the test.
class Listener final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit Listener(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }

  bool handleMessage(const TWReportingSessionMessage& message) override {
    const auto owner = session.lock();
    if (onMessage) onMessage(*owner, message);
    return true;
  }

  static std::function<void(TWReportingSession&, const TWReportingSessionMessage&)> onMessage;
};
const TWReportingSessionWorkerClass Listener::kWorkerClass = workerClassOf<Listener>("Listener");
decltype(Listener::onMessage) Listener::onMessage;

class SystemMonitorWorkerTest : public ReportingTest {
 protected:
  SystemMonitorWorkerTest() : ReportingTest({&Listener::kWorkerClass, &Worker::kWorkerClass}) {
    Listener::onMessage = [this](TWReportingSession& session, const TWReportingSessionMessage& message) {
      EXPECT_EQ(message.category, 8U);
      EXPECT_EQ(message.type, 5U);
      messages.emplace_back(session.reporterID(), message.message);
    };
  }
  ~SystemMonitorWorkerTest() override { Listener::onMessage = nullptr; }

  void initialize() {
    TWReportingSystemMonitor::initializeWithQueue(TWReportingUtilityGetReportingServerQueue());
  }
  static std::shared_ptr<ObservableMap> map() {
    return TWReportingSystemMonitor::getSystemMonitorDictionary();
  }
  void post(const char* name, std::uint64_t state) {
    EXPECT_FALSE(test.notifications.post(name, state));
    test.queues.runAll();
  }
  void setDeviceName(const char* name) {
    EXPECT_FALSE(test.preferences.write("com.orvane.tonewerk", "device_name", name));
  }
  std::shared_ptr<TWReportingSession> startSession(ReporterID reporterID = 77) {
    auto session = makeSession(reporterID);
    session->start();
    return session;
  }
  // Returns the messages since the last call, each as "identifier key=value".
  std::vector<std::string> takeTexts() {
    std::vector<std::string> texts;
    for (const auto& [reporterID, payload] : std::exchange(messages, {})) {
      const ValueMap::Entry& first = *payload.begin();
      texts.push_back(std::to_string(reporterID) + " " + first.key.string() + "=" + first.value.text());
    }
    return texts;
  }

  std::vector<std::pair<ReporterID, ValueMap>> messages;
};

TEST_F(SystemMonitorWorkerTest, IsAProducerAndNothingElse) {
  const TWReportingSessionWorkerClass& workerClass = Worker::kWorkerClass;
  EXPECT_EQ(workerClass.name, "TWReportingSessionSystemMonitorWorker");
  EXPECT_TRUE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.startOnInit);
  EXPECT_FALSE(workerClass.handleSingleMessageSession);
}

TEST_F(SystemMonitorWorkerTest, SendsASessionThatStartsTheStateOfEveryFeatureInOrder) {
  EXPECT_FALSE(test.preferences.write("com.orvane.homedeck", "spatial-audio-accessory-feature", 2));
  setDeviceName("Kitchen");
  initialize();
  post(kRinger, 1);
  startSession();
  EXPECT_THAT(takeTexts(), ElementsAre("77 spatial-audio-accessory-feature=2", "77 device_name=Kitchen",
                                       "77 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, ARingerWithoutStateAtTheStartIsSentAtItsFirstNotification) {
  setDeviceName("Kitchen");
  initialize();
  const auto session = startSession();
  EXPECT_THAT(takeTexts(), ElementsAre("77 device_name=Kitchen"));
  post(kRinger, 1);
  EXPECT_THAT(takeTexts(), ElementsAre("77 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, TheTimeOfTheReadIsSentAsLastUpdatedAndTheMessageHasItsOwnTime) {
  initialize();
  const auto session = startSession();
  const double readAt = test.clock.now();
  map()->set("ringerstate",
             {{"ringerstate", true}, {"twreporting_timestamp", readAt - 7}, {"systemuptime_sec", 43}});
  ASSERT_EQ(messages.size(), 1U);
  const ValueMap& sent = messages[0].second;
  EXPECT_EQ(*sent.find("ringerstate"), Value(true));
  EXPECT_EQ(*sent.find("last_updated"), Value(readAt - 7));
  EXPECT_EQ(*sent.find("twreporting_timestamp"), Value(readAt));
  EXPECT_FALSE(sent.contains("systemuptime_sec"));
}

TEST_F(SystemMonitorWorkerTest, TheStateInTheMapIsNotChanged) {
  initialize();
  const auto session = startSession();
  post(kRinger, 1);
  EXPECT_TRUE(map()->find("ringerstate")->contains("twreporting_timestamp"));
  EXPECT_FALSE(map()->find("ringerstate")->contains("last_updated"));
}

TEST_F(SystemMonitorWorkerTest, AStateWithoutATimeIsSentUnchanged) {
  initialize();
  const auto session = startSession();
  map()->set("ringerstate", {{"ringerstate", true}, {"systemuptime_sec", 43}});
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_FALSE(messages[0].second.contains("last_updated"));
  EXPECT_EQ(messages[0].second.integer("systemuptime_sec"), 43);
}

TEST_F(SystemMonitorWorkerTest, AnEmptyOrAbsentStateIsNotSent) {
  initialize();
  const auto session = startSession();
  map()->set("ringerstate", {});
  map()->set("ringerstate", {{"twreporting_timestamp", 1.0}, {"systemuptime_sec", 1}});
  EXPECT_THAT(takeTexts(), ElementsAre("77 last_updated=1"));
  Worker(session).handleChange(nullptr);
  EXPECT_THAT(takeTexts(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, AChangeIsSentToEveryStartedSession) {
  initialize();
  const auto first = startSession(1);
  const auto second = startSession(2);
  post(kRinger, 1);
  EXPECT_THAT(takeTexts(), ElementsAre("1 ringerstate=1", "2 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, AChangeBecomesPartOfTheSessionsState) {
  initialize();
  const auto session = startSession();
  setDeviceName("Kitchen");
  post(kReporting, 0);
  EXPECT_EQ(session->previousValues().text("device_name"), "Kitchen");
  EXPECT_THAT(textsUnder("device_name", session->messages()), ElementsAre("(null)", "Kitchen"));
}

TEST_F(SystemMonitorWorkerTest, NothingIsSentToAStoppedSession) {
  initialize();
  const auto session = startSession();
  session->stop();
  EXPECT_EQ(map()->observerCount(), 0U);
  post(kRinger, 1);
  EXPECT_THAT(takeTexts(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, ASessionThatStartsAgainGetsEachStateOnceAgain) {
  initialize();
  const auto session = startSession();
  post(kRinger, 1);
  session->stop();
  takeTexts();
  session->start();
  EXPECT_THAT(takeTexts(), ElementsAre("77 ringerstate=1"));
  post(kRinger, 0);
  EXPECT_THAT(takeTexts(), ElementsAre("77 ringerstate=0"));
}

TEST_F(SystemMonitorWorkerTest, NothingIsSentToASessionThatIsDestroyedWithoutAStop) {
  initialize();
  auto session = startSession();
  session.reset();
  EXPECT_EQ(map()->observerCount(), 0U);
  post(kRinger, 1);
  EXPECT_THAT(takeTexts(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, AWorkerMadeBeforeTheMonitorDoesNothingAndStopsWithoutFailing) {
  const auto session = startSession();
  initialize();
  post(kRinger, 1);
  EXPECT_THAT(takeTexts(), IsEmpty());
  session->stop();
  EXPECT_FALSE(session->started());
}

TEST_F(SystemMonitorWorkerTest, StartSucceedsWithAndWithoutAMonitor) {
  const auto session = makeSession();
  EXPECT_EQ(Worker(session).start(), true);
  initialize();
  EXPECT_EQ(Worker(session).start(), true);
}

TEST_F(SystemMonitorWorkerTest, AWorkerOutlivesTheMonitor) {
  initialize();
  const auto session = startSession();
  TWReportingSystemMonitor::reset();
  post(kRinger, 1);
  EXPECT_THAT(takeTexts(), IsEmpty());
  session->stop();
}

TEST_F(SystemMonitorWorkerTest, ASessionMayStopWhileItHandlesTheMessageOfAChange) {
  initialize();
  const auto first = startSession(1);
  const auto second = startSession(2);
  const auto record = Listener::onMessage;
  Listener::onMessage = [&](TWReportingSession& session, const TWReportingSessionMessage& message) {
    record(session, message);
    if (session.reporterID() != 1) return;
    first->stop();
    second->stop();
  };
  post(kRinger, 1);
  EXPECT_THAT(takeTexts(), ElementsAre("1 ringerstate=1"));
  EXPECT_FALSE(first->started() || second->started());
  post(kRinger, 0);
  EXPECT_THAT(takeTexts(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, ASessionMayStartWhileAnotherHandlesTheMessageOfAChange) {
  initialize();
  const auto first = startSession(1);
  std::shared_ptr<TWReportingSession> second;
  const auto record = Listener::onMessage;
  Listener::onMessage = [&](TWReportingSession& session, const TWReportingSessionMessage& message) {
    record(session, message);
    if (second == nullptr) {
      second = makeSession(2);
      second->start();
    }
  };
  post(kRinger, 1);
  // The second session gets the state at its start. The change itself notifies only the sessions that had
  // started before it.
  EXPECT_THAT(takeTexts(), ElementsAre("1 ringerstate=1", "2 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, ASessionMayBeDestroyedWhileItHandlesTheMessageOfAChange) {
  initialize();
  auto session = startSession();
  Listener::onMessage = [&](TWReportingSession&, const TWReportingSessionMessage&) { session.reset(); };
  post(kRinger, 1);
  EXPECT_EQ(session, nullptr);
  EXPECT_EQ(map()->observerCount(), 0U);
}

}  // namespace
}  // namespace tonewerk
