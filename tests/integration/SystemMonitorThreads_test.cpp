// SPDX-License-Identifier: Apache-2.0
//
// The system monitor and its workers on a real work queue, with all threads that may use them at once.
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
constexpr std::chrono::seconds kTimeout{60};
constexpr std::size_t kMaxSessions = 8;

constexpr char kRinger[] = "com.orvane.homedeck.ringerstate";
constexpr char kReporting[] = "com.orvane.tonewerk.reporting";

// Changes sessions as the test wants whenever one of them gets a message. When the system monitor's worker
// has sent the message, this happens inside the map's lock. Used on the work queue.
class SessionChanger final : public TWReportingSessionWorkerConsumerProtocol {
 public:
  static const TWReportingSessionWorkerClass kWorkerClass;
  const TWReportingSessionWorkerClass& workerClass() const override { return kWorkerClass; }
  explicit SessionChanger(const std::shared_ptr<TWReportingSession>& owner) { session = owner; }
  bool handleMessage(const TWReportingSessionMessage&) override {
    if (change) change();
    return true;
  }

  static std::function<void()> change;
};
const TWReportingSessionWorkerClass SessionChanger::kWorkerClass = workerClassOf<SessionChanger>("Meddler");
std::function<void()> SessionChanger::change;

// Makes, starts, stops and removes sessions in random order. Used on the work queue.
class Sessions {
 public:
  void change() {
    if (depth_ >= 3) return;  // a start sends messages, which call this again
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
  // Removes a session without a stop, as the loss of a client may do.
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

// The platform in memory, but with queues that have threads.
struct Rig {
  Rig() {
    test.log.setThreshold(LogLevel::kError);
    const Platform doubles =
        test.platformWith(test.log, test.tracePoints, test.clock, queues, test.metricon, test.linkReport);
    context.emplace(doubles, Classes{&SessionChanger::kWorkerClass,
                                     &TWReportingSessionSystemMonitorWorker::kWorkerClass});
  }

  using Classes = std::vector<const TWReportingSessionWorkerClass*>;
  TestPlatform test;
  ThreadQueueFactory queues;
  std::optional<TWReportingContext> context;
};

// Runs all pieces at once. A deadlock ends the process, because the threads cannot be joined.
void runTogether(const std::vector<std::function<void()>>& pieces) {
  std::vector<std::future<void>> ends;
  for (const auto& piece : pieces) ends.push_back(std::async(std::launch::async, piece));
  for (std::future<void>& end : ends) {
    if (end.wait_for(kTimeout) == std::future_status::ready) continue;
    ADD_FAILURE() << "some threads wait for each other";
    std::abort();
  }
}

TEST(SystemMonitorThreadsTest, NoOrderOfStartsChangesAndStopsDeadlocks) {
  Rig rig;
  Sessions sessions;
  SessionChanger::change = [&] { sessions.change(); };
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
      // A thread of its own that reads and observes the map.
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
  SessionChanger::change = nullptr;
}

}  // namespace
}  // namespace tonewerk
