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

// A consumer that does what the test wants with each message.
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
    Listener::onMessage = [this](TWReportingSession& session, const TWReportingSessionMessage& heard) {
      EXPECT_EQ(heard.category, 8U);
      EXPECT_EQ(heard.type, 5U);
      messages.emplace_back(session.reporterID(), heard.message);
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
  void nameDevice(const char* name) {
    EXPECT_FALSE(test.preferences.write("com.orvane.tonewerk", "device_name", name));
  }
  std::shared_ptr<TWReportingSession> startSession(ReporterID reporterID = 77) {
    auto session = makeSession(reporterID);
    session->start();
    return session;
  }
  // What was heard since the last time, "identifier key=value" a message.
  std::vector<std::string> heard() {
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

TEST_F(SystemMonitorWorkerTest, TellsASessionThatStartsTheStateOfEveryFeatureInOrder) {
  EXPECT_FALSE(test.preferences.write("com.orvane.homedeck", "spatial-audio-accessory-feature", 2));
  nameDevice("Kitchen");
  initialize();
  post(kRinger, 1);
  startSession();
  EXPECT_THAT(heard(), ElementsAre("77 spatial-audio-accessory-feature=2", "77 device_name=Kitchen",
                                   "77 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, ARingerWithoutStateAtTheStartIsToldOfAtItsFirstNotification) {
  nameDevice("Kitchen");
  initialize();
  const auto session = startSession();
  EXPECT_THAT(heard(), ElementsAre("77 device_name=Kitchen"));
  post(kRinger, 1);
  EXPECT_THAT(heard(), ElementsAre("77 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, TheTimeOfTheReadIsToldAsLastUpdatedAndTheMessageHasItsOwn) {
  initialize();
  const auto session = startSession();
  const double readAt = test.clock.now();
  map()->set("ringerstate",
             {{"ringerstate", true}, {"twreporting_timestamp", readAt - 7}, {"systemuptime_sec", 43}});
  ASSERT_EQ(messages.size(), 1U);
  const ValueMap& told = messages[0].second;
  EXPECT_EQ(*told.find("ringerstate"), Value(true));
  EXPECT_EQ(*told.find("last_updated"), Value(readAt - 7));
  EXPECT_EQ(*told.find("twreporting_timestamp"), Value(readAt));
  EXPECT_FALSE(told.contains("systemuptime_sec"));
}

TEST_F(SystemMonitorWorkerTest, TheMapsOwnStateStaysAsItIs) {
  initialize();
  const auto session = startSession();
  post(kRinger, 1);
  EXPECT_TRUE(map()->find("ringerstate")->contains("twreporting_timestamp"));
  EXPECT_FALSE(map()->find("ringerstate")->contains("last_updated"));
}

TEST_F(SystemMonitorWorkerTest, AStateWithoutATimeIsToldAsItIs) {
  initialize();
  const auto session = startSession();
  map()->set("ringerstate", {{"ringerstate", true}, {"systemuptime_sec", 43}});
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_FALSE(messages[0].second.contains("last_updated"));
  EXPECT_EQ(messages[0].second.integer("systemuptime_sec"), 43);
}

TEST_F(SystemMonitorWorkerTest, AnEmptyOrAbsentStateTellsNothing) {
  initialize();
  const auto session = startSession();
  map()->set("ringerstate", {});
  map()->set("ringerstate", {{"twreporting_timestamp", 1.0}, {"systemuptime_sec", 1}});
  EXPECT_THAT(heard(), ElementsAre("77 last_updated=1"));
  Worker(session).handleChange(nullptr);
  EXPECT_THAT(heard(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, EveryRunningSessionIsToldOfAChange) {
  initialize();
  const auto first = startSession(1);
  const auto second = startSession(2);
  post(kRinger, 1);
  EXPECT_THAT(heard(), ElementsAre("1 ringerstate=1", "2 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, AChangeBecomesPartOfTheSessionsState) {
  initialize();
  const auto session = startSession();
  nameDevice("Kitchen");
  post(kReporting, 0);
  EXPECT_EQ(session->previousValues().text("device_name"), "Kitchen");
  EXPECT_THAT(textsUnder("device_name", session->messages()), ElementsAre("(null)", "Kitchen"));
}

TEST_F(SystemMonitorWorkerTest, AStoppedSessionIsToldNothing) {
  initialize();
  const auto session = startSession();
  session->stop();
  EXPECT_EQ(map()->observerCount(), 0U);
  post(kRinger, 1);
  EXPECT_THAT(heard(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, ASessionThatStartsAgainIsToldAgainAndOnce) {
  initialize();
  const auto session = startSession();
  post(kRinger, 1);
  session->stop();
  heard();
  session->start();
  EXPECT_THAT(heard(), ElementsAre("77 ringerstate=1"));
  post(kRinger, 0);
  EXPECT_THAT(heard(), ElementsAre("77 ringerstate=0"));
}

TEST_F(SystemMonitorWorkerTest, ASessionThatIsLetGoWithoutAStopIsToldNothing) {
  initialize();
  auto session = startSession();
  session.reset();
  EXPECT_EQ(map()->observerCount(), 0U);
  post(kRinger, 1);
  EXPECT_THAT(heard(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, AWorkerMadeBeforeTheMonitorDoesNothingAndStopsWithoutFailing) {
  const auto session = startSession();
  initialize();
  post(kRinger, 1);
  EXPECT_THAT(heard(), IsEmpty());
  session->stop();
  EXPECT_FALSE(session->started());
}

TEST_F(SystemMonitorWorkerTest, ReportsSuccessAtItsStartWithAndWithoutAMonitor) {
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
  EXPECT_THAT(heard(), IsEmpty());
  session->stop();
}

TEST_F(SystemMonitorWorkerTest, ASessionMayStopInsideTheMessageThatTellsOfAChange) {
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
  EXPECT_THAT(heard(), ElementsAre("1 ringerstate=1"));
  EXPECT_FALSE(first->started() || second->started());
  post(kRinger, 0);
  EXPECT_THAT(heard(), IsEmpty());
}

TEST_F(SystemMonitorWorkerTest, ASessionMayStartInsideTheMessageThatTellsOfAChange) {
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
  // The second is told at its start; the change it came in wakes only those that were there before.
  EXPECT_THAT(heard(), ElementsAre("1 ringerstate=1", "2 ringerstate=1"));
}

TEST_F(SystemMonitorWorkerTest, ASessionMayEndInsideTheMessageThatTellsOfAChange) {
  initialize();
  auto session = startSession();
  Listener::onMessage = [&](TWReportingSession&, const TWReportingSessionMessage&) { session.reset(); };
  post(kRinger, 1);
  EXPECT_EQ(session, nullptr);
  EXPECT_EQ(map()->observerCount(), 0U);
}

}  // namespace
}  // namespace tonewerk
