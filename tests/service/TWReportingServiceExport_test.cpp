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

namespace tonewerk {
namespace {

std::size_t indexOf(const Method& method) { return *requests::all().find(method.name); }

class TWReportingServiceExportTest : public ServiceTest {
 protected:
  const std::shared_ptr<TWReportingServiceExport> object = std::make_shared<TWReportingServiceExport>(
      std::make_shared<TWReportingClientServerInstance>(11, service),
      std::make_unique<WatchRequests>(11, service));
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

TEST_F(TWReportingServiceExportTest, HasTheWorkQueueDeliverWhatWasReceived) {
  class Received final : public ReceivedRequests {
   public:
    explicit Received(int& deliveries) : deliveries_(deliveries) {}
    void deliver() override {
      EXPECT_TRUE(TWReportingUtilityGetReportingServerQueue().isCurrent());
      ++deliveries_;
    }

   private:
    int& deliveries_;
  };
  int deliveries = 0;
  object->handleReceived(std::make_unique<Received>(deliveries));
  EXPECT_EQ(deliveries, 0);
  run();
  EXPECT_EQ(deliveries, 1);
}

TEST_F(TWReportingServiceExportTest, RequestsThatTheWorkQueueDeliversRunAtOnceAndInOrder) {
  class Received final : public ReceivedRequests {
   public:
    explicit Received(RequestHandler& handler) : handler_(handler) {}
    void deliver() override {
      handler_.handleRequest(indexOf(requests::kObserve), {}, {}, {});
      handler_.handleRequest(indexOf(requests::kKillService), {}, {}, {});
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
