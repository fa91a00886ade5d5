// SPDX-License-Identifier: Apache-2.0
#include "driver/TWReportingSessionDriverSnapshotWorker.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <memory>
#include <thread>
#include <vector>

#include "driver/DriverTest.h"
#include "platform/accounts/WorkingFor.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

using namespace channels;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class TWReportingSessionDriverSnapshotWorkerTest : public DriverTest {
 protected:
  TWReportingSessionDriverSnapshotWorkerTest() { setVolts(10); }

  void setVolts(std::int64_t volts) { chanmeter.setRecords({simple(speaker("volts"), volts)}); }

  static Sent volts(std::int64_t change) {
    return {kChanmetering, 16, {{"Amp_Speaker_Simple_volts", change}}};
  }

  std::size_t timesSubscribed() const {
    const auto calls = chanmeter.calls();
    return static_cast<std::size_t>(
        std::count(calls.begin(), calls.end(), "createSubscription Speaker-(null)"));
  }

  std::shared_ptr<TWReportingSession> session = makeSession();
  TWReportingSessionDriverSnapshotWorker worker{session};
};

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, IsAProducerThatTakesNoMessages) {
  const auto& workerClass = TWReportingSessionDriverSnapshotWorker::kWorkerClass;
  EXPECT_EQ(workerClass.name, "TWReportingSessionDriverSnapshotWorker");
  EXPECT_TRUE(workerClass.isProducer);
  EXPECT_FALSE(workerClass.isConsumer);
  EXPECT_FALSE(workerClass.startOnInit);
  EXPECT_FALSE(workerClass.handleSingleMessageSession);
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, IsMadeForAnySessionAndHoldsItWeakly) {
  const auto made = TWReportingSessionDriverSnapshotWorker::kWorkerClass.initWithSession(session);
  ASSERT_NE(made, nullptr);
  EXPECT_EQ(made->session.lock(), session);
  EXPECT_EQ(session.use_count(), 1);
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, StartTakesASnapshotAndReturnsTrue) {
  EXPECT_EQ(worker.driverSnapShot(), std::nullopt);
  EXPECT_EQ(worker.start(), true);
  ASSERT_TRUE(worker.driverSnapShot());
  EXPECT_THAT(*worker.driverSnapShot(), SizeIs(1));
  EXPECT_FALSE(worker.started) << "kept by the session";
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, StopSendsWhatChangedSinceStartAndDropsTheSnapshot) {
  EXPECT_EQ(worker.start(), true);
  setVolts(12);
  worker.stop();
  EXPECT_THAT(sentTo(*session), ElementsAre(volts(2)));
  EXPECT_EQ(worker.driverSnapShot(), std::nullopt);
  EXPECT_EQ(chanmeter.heldSamples(), 0U);
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, StopSendsAtMostThreeMessagesOfWhatChanged) {
  const auto records = [](std::int64_t more) {
    return std::vector<ChanmeterRecord>{
        simple(speaker("volts"), 10 + more), simple(speaker("same"), 1),
        histogram(speaker("delay"), {{0, 10, 5 + more}}),
        states(speaker("power"), {{"on", 1, static_cast<std::uint64_t>(100 + more), 1}})};
  };
  chanmeter.setRecords(records(0));
  EXPECT_EQ(worker.start(), true);
  chanmeter.setRecords(records(2));
  worker.stop();
  EXPECT_THAT(
      sentTo(*session),
      ElementsAre(
          volts(2),
          Sent{kChanmetering,
               17,
               {{"Amp_Speaker_Histogram_delay", "count=1,lower=0,upper=10,min=0,max=0,unit=(null)::0-10:2"}}},
          Sent{kChanmetering,
               18,
               {{"Amp_Speaker_State_power", "name:on,transition:0,residency:2,duty_cycle:1.000000;"}}}));
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, ASecondStartReplacesTheSnapshot) {
  EXPECT_EQ(worker.start(), true);
  setVolts(15);
  EXPECT_EQ(worker.start(), true);
  EXPECT_EQ(chanmeter.heldSamples(), 1U);
  setVolts(16);
  worker.stop();
  EXPECT_THAT(sentTo(*session), ElementsAre(volts(1)));
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, StopBeforeAnyStartInTheProcessDoesNothing) {
  worker.stop();
  EXPECT_THAT(sentTo(*session), IsEmpty());
  EXPECT_THAT(chanmeter.calls(), IsEmpty());
  EXPECT_THAT(test.log.linesOf("twrd"), IsEmpty());
  EXPECT_EQ(context->singletons().find<TWReportingDriverUtility>(), nullptr);
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, StopWithoutStartSendsNothingOnceAnotherHasStarted) {
  const auto otherSession = makeSession(78);
  TWReportingSessionDriverSnapshotWorker other(otherSession);
  EXPECT_EQ(other.start(), true);
  chanmeter.clearCalls();
  setVolts(12);
  worker.stop();
  EXPECT_THAT(sentTo(*session), IsEmpty());
  EXPECT_THAT(chanmeter.calls(), ElementsAre("createSamples Speaker-(null)"));
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, ASecondStopSendsNothing) {
  EXPECT_EQ(worker.start(), true);
  setVolts(12);
  worker.stop();
  setVolts(20);
  worker.stop();
  EXPECT_THAT(sentTo(*session), ElementsAre(volts(2)));
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, StopAfterItsSessionHasEndedDropsTheSnapshot) {
  EXPECT_EQ(worker.start(), true);
  session.reset();
  setVolts(12);
  worker.stop();
  EXPECT_EQ(worker.driverSnapShot(), std::nullopt);
  EXPECT_EQ(chanmeter.heldSamples(), 0U);
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest, ParallelSessionsShareOneSamplerAndKeepTheirOwnSnapshots) {
  const auto otherSession = makeSession(78);
  TWReportingSessionDriverSnapshotWorker other(otherSession);
  EXPECT_EQ(worker.start(), true);
  setVolts(13);
  EXPECT_EQ(other.start(), true);
  EXPECT_EQ(timesSubscribed(), 1U);
  setVolts(20);
  worker.stop();
  EXPECT_THAT(sentTo(*session), ElementsAre(volts(10)));
  setVolts(21);
  other.stop();
  EXPECT_THAT(sentTo(*otherSession), ElementsAre(volts(8)));
  EXPECT_EQ(timesSubscribed(), 1U);
}

TEST_F(TWReportingSessionDriverSnapshotWorkerTest,
       ThreadsThatUseTheSamplerFirstMakeOneTogetherAndSampleAtOnce) {
  constexpr std::size_t kSessions = 8;
  std::vector<std::shared_ptr<TWReportingSession>> sessions;
  for (std::size_t i = 0; i < kSessions; ++i)
    sessions.push_back(makeSession(static_cast<ReporterID>(100 + i)));
  std::vector<std::thread> threads;
  threads.reserve(sessions.size());
  for (const auto& owner : sessions) {
    threads.emplace_back([&owner] {
      const auto& sampler = TWReportingContext::current().singletons().get<TWReportingDriverUtility>();
      const TWReportingDriverUtility::Snapshot snapshot = sampler.getSnapShot();
      sampler.sendDriverLogsForSession(owner.get(), &snapshot);
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(timesSubscribed(), 1U);
  for (const auto& owner : sessions) EXPECT_THAT(sentTo(*owner), IsEmpty()) << "nothing changed";
  EXPECT_EQ(chanmeter.heldSamples(), 0U);
}

// Tests what a snapshot costs the user for whom its session starts.
class DriverSnapshotChargeTest : public TWReportingSessionDriverSnapshotWorkerTest {
 protected:
  static constexpr Resource kSnapshots = Resource::kSnapshotBytes;
  using Worker = TWReportingSessionDriverSnapshotWorker;

  DriverSnapshotChargeTest() { setChannels(100); }

  void setChannels(std::size_t count) {
    std::vector<ChanmeterRecord> records;
    for (std::size_t number = 0; number < count; ++number)
      records.push_back(simple(speaker(std::to_string(number)), 1));
    chanmeter.setRecords(std::move(records));
  }
  void startFor(const std::shared_ptr<Account>& account, Worker& started) {
    const WorkingFor scope(account);
    EXPECT_EQ(started.start(), true);
  }
  std::uint64_t held() const { return user->held(kSnapshots); }
  std::uint64_t held(const std::shared_ptr<Account>& account) const { return account->held(kSnapshots); }

  const std::shared_ptr<Account> user = test.accounts.of(1001);
};

TEST_F(DriverSnapshotChargeTest, ASnapshotIsChargedToTheUserOfItsSessionUntilItStops) {
  startFor(user, worker);
  constexpr std::size_t kReferences = 100 * sizeof(ChanmeterRecords::value_type);
  EXPECT_GE(held(), kReferences);
  EXPECT_LE(held(), 2 * kReferences) << "the records themselves are not";
  EXPECT_EQ(test.accounts.totals().held(kSnapshots), held());
  worker.stop();
  EXPECT_EQ(held(), 0U);
}

TEST_F(DriverSnapshotChargeTest, EachOfTwoSnapshotsIsChargedAndGivenBackWithItsWorker) {
  startFor(user, worker);
  const std::uint64_t one = held();
  {
    Worker other(session);
    startFor(user, other);
    EXPECT_EQ(held(), 2 * one);
  }
  EXPECT_EQ(held(), one);
}

TEST_F(DriverSnapshotChargeTest, ASecondStartChargesTheNewSnapshotInPlaceOfTheFirst) {
  startFor(user, worker);
  const std::uint64_t first = held();
  setChannels(50);  // these were subscribed, too
  const std::shared_ptr<Account> other = test.accounts.of(1002);
  startFor(other, worker);
  EXPECT_EQ(held(), 0U);
  EXPECT_GT(held(other), 0U);
  EXPECT_LT(held(other), first);
}

TEST_F(DriverSnapshotChargeTest, ASecondStartNeedsNoRoomForTheFirstSnapshot) {
  startFor(user, worker);
  test.accounts.totals().setTotal(kSnapshots, 2 * held());
  startFor(user, worker);
  EXPECT_TRUE(worker.driverSnapShot());
  EXPECT_EQ(user->refused(kSnapshots), 0U);
}

TEST_F(DriverSnapshotChargeTest, ASnapshotForNobodyInParticularIsChargedToTheDaemonsOwnUser) {
  EXPECT_EQ(worker.start(), true);
  EXPECT_GT(held(test.accounts.own()), 0U);
  worker.stop();
  EXPECT_EQ(held(test.accounts.own()), 0U);
}

TEST_F(DriverSnapshotChargeTest, WithoutRoomThereIsNoSnapshotAndOneErrorLine) {
  test.accounts.totals().setTotal(kSnapshots, 100);
  startFor(user, worker);
  EXPECT_EQ(worker.driverSnapShot(), std::nullopt);
  EXPECT_EQ(chanmeter.heldSamples(), 0U);
  EXPECT_EQ(held(), 0U);
  EXPECT_EQ(user->refused(kSnapshots), 1U);
  EXPECT_THAT(logged(LogLevel::kError),
              ElementsAre(testing::MatchesRegex("no driver statistics: [0-9]+ bytes are more than is left of "
                                                "the share of user 1001. reporterID=77")));
  setVolts(12);
  worker.stop();
  EXPECT_THAT(sentTo(*session), IsEmpty());
  EXPECT_THAT(logged(LogLevel::kError), SizeIs(1));
}

TEST_F(DriverSnapshotChargeTest, AUserWithManySessionsLeavesRoomForTheSnapshotsOfOthers) {
  startFor(user, worker);
  test.accounts.totals().setTotal(kSnapshots, 20 * held());
  std::vector<std::unique_ptr<Worker>> many;
  for (int count = 0; count < 100; ++count) {
    many.push_back(std::make_unique<Worker>(session));
    startFor(user, *many.back());
  }
  EXPECT_LE(held(), test.accounts.totals().total(kSnapshots) / 2);
  EXPECT_EQ(many.back()->driverSnapShot(), std::nullopt);

  Worker other(makeSession(78));
  startFor(test.accounts.of(1002), other);
  EXPECT_TRUE(other.driverSnapShot());

  many.clear();
  Worker later(session);
  startFor(user, later);
  EXPECT_TRUE(later.driverSnapShot());
}

// Runs the worker together with the daemon's other workers.
class DriverStatisticsOfASessionTest : public DriverTest {
 protected:
  DriverStatisticsOfASessionTest() { useWorkers(allWorkerClasses()); }
};

TEST_F(DriverStatisticsOfASessionTest, ReachItsConsumersWhileItStops) {
  chanmeter.setRecords({simple(speaker("volts"), 10)});
  const auto session = makeSession();
  session->setServiceType(kServiceTest);
  session->start();
  chanmeter.setRecords({simple(speaker("volts"), 12)});
  session->stop();
  const auto events = test.metricon.eventsNamed("com.orvane.tonewerk.Chanmetering.Simple");
  ASSERT_THAT(events, SizeIs(1));
  EXPECT_EQ(events[0].integer("Amp_Speaker_Simple_volts"), 2);
}

TEST_F(DriverStatisticsOfASessionTest, AreMissingWithoutRoomAndTheSessionReportsEverythingElse) {
  test.accounts.totals().setTotal(Resource::kSnapshotBytes, 10);
  chanmeter.setRecords({simple(speaker("volts"), 10)});
  const auto session = makeSession();
  session->setServiceType(kServiceTest);
  session->start();
  session->sendMessage(message({{"key", 1}}, kChanmetering, 17));
  chanmeter.setRecords({simple(speaker("volts"), 12)});
  session->stop();
  EXPECT_THAT(test.metricon.eventsNamed("com.orvane.tonewerk.Chanmetering.Simple"), IsEmpty());
  EXPECT_THAT(test.metricon.eventsNamed("com.orvane.tonewerk.Chanmetering.Histogram"), SizeIs(1));
}

}  // namespace
}  // namespace tonewerk
