// SPDX-License-Identifier: Apache-2.0
//
// The system monitor and its workers on a real work queue, with everybody who may reach them at once.
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <functional>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "monitor/TWReportingSessionSystemMonitorWorker.h"
#include "monitor/TWReportingSystemMonitor.h"
#include "platform/linux/threads/ThreadQueueFactory.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "session/TWReportingSessionMessage.h"
#include "session/TWReportingUtility.h"
#include "support/TestPlatform.h"

namespace tonewerk {
namespace {

constexpr int kRounds = 400;
constexpr std::chrono::seconds kPatience{60};
constexpr std::size_t kMaxSessions = 8;

constexpr char kRinger[] = "com.orvane.homedeck.ringerstate";
constexpr char kReporting[] = "com.orvane.tonewerk.reporting";

// Does to the sessions what the test wants whenever one of them gets a message: from inside the map's lock
// when the system monitor's worker sent it. On the work queue.
class Meddler final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit Meddler(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  bool handleMessage(const TWReportingSessionMessage&) override {
    if (meddle) meddle();
    return true;
  }

  static std::function<void()> meddle;
};
const TWReportingSessionWorkerClass Meddler::kWorkerClass = workerClassOf<Meddler>("Meddler");
std::function<void()> Meddler::meddle;

// Sessions that come, start, stop and go in an order that nobody chose. On the work queue.
class Sessions {
 public:
  void change() {
    if (depth_ >= 3) return;  // a start sends messages, which come here again
    ++depth_;
    switch (random_() % 4) {
      case 0:
        add();
        break;
      case 1:
        if (const auto session = any()) session->stop();
        break;
      case 2:
        if (const auto session = any()) session->start();
        break;
      default:
        removeAny();
    }
    --depth_;
    ++changes_;
  }
  void clear() { sessions_.clear(); }
  int changes() const { return changes_; }

 private:
  using Session = std::shared_ptr<TWReportingSession>;

  void add() {
    if (sessions_.size() >= kMaxSessions) return;
    sessions_.push_back(TWReportingSession::initWithID(++lastIdentifier_, {4711}));
    const Session session = sessions_.back();
    session->start();
  }
  Session any() { return sessions_.empty() ? nullptr : sessions_[random_() % sessions_.size()]; }
  // Without a stop, as a client that is lost may leave it.
  void removeAny() {
    if (sessions_.empty()) return;
    const auto at = sessions_.begin() + static_cast<std::ptrdiff_t>(random_() % sessions_.size());
    const Session removed = std::move(*at);
    sessions_.erase(at);
  }

  std::minstd_rand random_{42};
  std::vector<Session> sessions_;
  ReporterID lastIdentifier_ = 0;
  int depth_ = 0;
  int changes_ = 0;
};

// The platform in memory, with the system's threads for its queues.
struct Rig {
  Rig() {
    test.log.setThreshold(LogLevel::kError);
    const Platform doubles =
        test.platformWith(test.log, test.tracePoints, test.clock, queues, test.metricon, test.linkReport);
    context.emplace(doubles,
                    Classes{&Meddler::kWorkerClass, &TWReportingSessionSystemMonitorWorker::kWorkerClass});
  }

  using Classes = std::vector<const TWReportingSessionWorkerClass*>;
  TestPlatform test;
  ThreadQueueFactory queues;
  std::optional<TWReportingContext> context;
};

// Runs them all at once; a deadlock ends the process, since its threads cannot be joined.
void runTogether(const std::vector<std::function<void()>>& pieces) {
  std::vector<std::future<void>> ends;
  for (const auto& piece : pieces) ends.push_back(std::async(std::launch::async, piece));
  for (std::future<void>& end : ends) {
    if (end.wait_for(kPatience) == std::future_status::ready) continue;
    ADD_FAILURE() << "some threads wait for each other";
    std::abort();
  }
}

TEST(SystemMonitorThreadsTest, NoOrderOfStartsChangesAndStopsDeadlocks) {
  Rig rig;
  Sessions sessions;
  Meddler::meddle = [&] { sessions.change(); };
  SerialQueue& queue = TWReportingUtilityGetReportingServerQueue();
  TWReportingSystemMonitor::initializeWithQueue(queue);

  const auto repeat = [](const std::function<void(int)>& step) {
    return [step] {
      for (int round = 0; round < kRounds; ++round) step(round);
    };
  };
  std::atomic<int> seen = 0;
  runTogether({
      repeat([&](int round) {
        EXPECT_FALSE(rig.test.notifications.post(kRinger, static_cast<std::uint64_t>(round % 3)));
      }),
      repeat([&](int round) {
        EXPECT_FALSE(rig.test.preferences.write("com.orvane.tonewerk", "device_name", round));
        EXPECT_FALSE(rig.test.notifications.post(kReporting));
        rig.test.clock.advance(0.001);
      }),
      repeat([&](int) {
        queue.async([&] { sessions.change(); });
        queue.drain();
      }),
      // Somebody who looks from outside, and observes.
      repeat([&](int) {
        const auto map = TWReportingSystemMonitor::getSystemMonitorDictionary();
        if (map == nullptr) return;
        const auto observation =
            ObservableMap::observe(map, "ringerstate", [&](std::string_view) { ++seen; });
        static_cast<void>(map->find("device_name"));
      }),
      repeat([&](int round) {
        if (round % 10 != 0) return;
        queue.async([&] {
          TWReportingSystemMonitor::reset();
          TWReportingSystemMonitor::initializeWithQueue(queue);
        });
        queue.drain();
      }),
  });
  queue.async([&] {
    EXPECT_GE(sessions.changes(), kRounds);
    sessions.clear();
    TWReportingSystemMonitor::reset();
  });
  queue.drain();
  EXPECT_TRUE(rig.test.notifications.registered().empty());
  Meddler::meddle = nullptr;
}

}  // namespace
}  // namespace tonewerk
