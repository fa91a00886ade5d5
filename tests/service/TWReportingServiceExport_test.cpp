// SPDX-License-Identifier: Apache-2.0
#include "service/TWReportingServiceExport.h"

#include <gmock/gmock.h>
#include <memory>

#include "platform/SerialQueue.h"
#include "protocol/Requests.h"
#include "service/TWReportingClientServerInstance.h"
#include "service/WatchRequests.h"
#include "session/TWReportingUtility.h"
#include "support/ServiceTest.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

std::size_t indexOf(const Method& method) { return *requests::all().find(method.name); }

class TWReportingServiceExportTest : public ServiceTest {
 protected:
  const std::shared_ptr<TWReportingServiceExport> object = std::make_shared<TWReportingServiceExport>(
      std::make_shared<TWReportingClientServerInstance>(11, owner(), service),
      std::make_unique<WatchRequests>(11, owner(), service), owner());
};

TEST_F(TWReportingServiceExportTest, OnlyTheRequestToEndTheProcessIsUrgent) {
  for (std::size_t method = 0; method < requests::kAll.size(); ++method) {
    if (requests::kAll[method].name == requests::kObserve.name) continue;
    EXPECT_EQ(object->isUrgent(method), method == indexOf(requests::kKillService))
        << requests::kAll[method].name;
  }
}

// Otherwise the request would run before the one to be an onlooker, which forbids it.
TEST_F(TWReportingServiceExportTest, TheRequestToEndTheProcessWaitsForAnEarlierOneToObserve) {
  EXPECT_FALSE(object->isUrgent(indexOf(requests::kObserve)));
  EXPECT_FALSE(object->isUrgent(indexOf(requests::kKillService)));
}

TEST_F(TWReportingServiceExportTest, AClientsRequestToEndTheProcessIsUrgentAlsoAfterARefusedOneToObserve) {
  object->handleRequest(indexOf(requests::kCreateReportingSession), {Value(77)}, {}, {});
  EXPECT_FALSE(object->isUrgent(indexOf(requests::kObserve)));
  EXPECT_TRUE(object->isUrgent(indexOf(requests::kKillService)));
}

TEST_F(TWReportingServiceExportTest, HasTheWorkQueueDeliverWhatWasReceivedInAsManyTurnsAsItTakes) {
  class Received final : public ReceivedRequests {
   public:
    explicit Received(int& deliveries) : deliveries_(deliveries) {}
    bool deliver() override {
      EXPECT_TRUE(TWReportingUtilityGetReportingServerQueue().isCurrent());
      return ++deliveries_ == 2;
    }

   private:
    int& deliveries_;
  };
  int deliveries = 0;
  object->handleReceived(std::make_unique<Received>(deliveries));
  EXPECT_EQ(deliveries, 0);
  run();
  EXPECT_EQ(deliveries, 2);
}

// Of which some can be delivered at once.
class QuickRequests final : public ReceivedRequests {
 public:
  struct Deliveries {
    int quick = 0;
    int rest = 0;
  };
  QuickRequests(Deliveries& deliveries, bool areAllQuick)
      : deliveries_(deliveries), areAllQuick_(areAllQuick) {}

  bool deliver() override {
    ++deliveries_.rest;
    return true;
  }
  bool deliverQuick() override {
    EXPECT_TRUE(TWReportingUtilityGetReportingServerQueue().isCurrent());
    ++deliveries_.quick;
    return areAllQuick_;
  }

 private:
  Deliveries& deliveries_;
  const bool areAllQuick_;
};

TEST_F(TWReportingServiceExportTest, DeliversQuickRequestsAtOnceWhileTheWorkQueueHasNothingToDo) {
  ManualSerialQueue& queue = *test.queues.find(TWReportingUtilityGetReportingServerQueue().name());
  queue.allowRunningAtOnce();
  run();
  QuickRequests::Deliveries deliveries;
  object->handleReceived(std::make_unique<QuickRequests>(deliveries, true));
  EXPECT_EQ(deliveries.quick, 1);
  EXPECT_EQ(queue.pendingCount(), 0U);
}

TEST_F(TWReportingServiceExportTest, HasTheWorkQueueDeliverWhatIsNotQuick) {
  ManualSerialQueue& queue = *test.queues.find(TWReportingUtilityGetReportingServerQueue().name());
  queue.allowRunningAtOnce();
  run();
  QuickRequests::Deliveries deliveries;
  object->handleReceived(std::make_unique<QuickRequests>(deliveries, false));
  EXPECT_EQ(deliveries.rest, 0);
  object->handleReceived(std::make_unique<QuickRequests>(deliveries, true));  // not before the first ones
  EXPECT_EQ(deliveries.quick, 1);
  run();
  EXPECT_EQ(deliveries.rest, 2);
}

TEST_F(TWReportingServiceExportTest, RequestsThatOnlyReadAreQuick) {
  for (std::size_t method = 0; method < requests::kAll.size(); ++method) {
    const std::string_view name = requests::kAll[method].name;
    const bool onlyReads = name == "getServiceNameForReporterID" || name == "reporterIDValid" ||
                           name == "getAllReporters" || name == "observe" || name == "watch.accounts";
    EXPECT_EQ(object->isQuick(method, nullptr), onlyReads) << name;
  }
}

TEST_F(TWReportingServiceExportTest, AMessageIsQuickForOneSessionAndATypeThatMakesNobodyWait) {
  const std::size_t method = indexOf(requests::kSendMessage);
  IncomingMessage message;
  message.type = kTypeStart;
  EXPECT_FALSE(object->isQuick(method, &message));  // for all sessions
  message.reporterIDs = {77};
  EXPECT_TRUE(object->isQuick(method, &message));
  message.reporterIDs = {77, 78};
  EXPECT_FALSE(object->isQuick(method, &message));
}

TEST(TWReportingServiceExportWorkersTest, AMessageIsNotQuickWhenAWorkerMayWaitForIt) {
  MessageTypes slow = MessageTypes::none();
  for (const TWReportingSessionWorkerClass* workerClass : allWorkerClasses())
    slow = slow | workerClass->slowTypes;
  EXPECT_TRUE(slow.contains(kTypeError));      // a stall trace may begin after a pause
  EXPECT_TRUE(slow.contains(kTypeMemoryLog));  // runs tools
  EXPECT_FALSE(slow.contains(kTypeStart));
  EXPECT_FALSE(slow.contains(kTypeUnknown));
}

TEST_F(TWReportingServiceExportTest, RequestsThatTheWorkQueueDeliversRunAtOnceAndInOrder) {
  class Received final : public ReceivedRequests {
   public:
    explicit Received(RequestHandler& handler) : handler_(handler) {}
    bool deliver() override {
      handler_.handleRequest(indexOf(requests::kObserve), {}, {}, {});
      handler_.handleRequest(indexOf(requests::kKillService), {}, {}, {});
      return true;
    }

   private:
    RequestHandler& handler_;
  };
  object->handleReceived(std::make_unique<Received>(*object));
  run();
  EXPECT_EQ(processEnds, 0);
}

}  // namespace
}  // namespace tonewerk
