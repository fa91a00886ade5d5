// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/InotifyNotificationService.h"

#include <chrono>
#include <condition_variable>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <mutex>
#include <string>

#include "platform/linux/threads/ThreadQueue.h"
#include "platform/linux/threads/TimerThread.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;
using Token = NotificationService::Token;

constexpr char kName[] = "com.orvane.test.changed";

// Tests the service from the view of processes that know only its files.
class InotifyNotificationServiceTest : public ::testing::Test {
 protected:
  Token registerName(const std::string& name) {
    const auto registration = service.registerHandler(name, queue, [this](Token token) {
      {
        const MutexLock lock(mutex);
        ++calls[token];
      }
      changed.notifyAll();
    });
    EXPECT_EQ(registration.status, NotificationService::kStatusOk);
    return registration.token;
  }
  int count(Token token) {
    const MutexLock lock(mutex);
    return calls[token];
  }
  bool waitForMoreThan(int before, Token token) {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    MutexLock lock(mutex);
    while (calls[token] <= before && changed.waitUntil(lock, end)) {
    }
    return calls[token] > before;
  }
  std::string file(const std::string& name = kName) const { return notifications + "/" + name; }

  TemporaryDirectory directory;
  const std::string notifications = directory.path("runtime/notifications");
  MemoryLog log;
  LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  Mutex mutex;
  Condition changed;
  std::map<Token, int> calls GUARDED_BY(mutex);
  ThreadQueue queue{"test", QueuePriority::kUtility};
  TimerThread timers;
  InotifyNotificationService service{notifications, timers, category};
};

TEST_F(InotifyNotificationServiceTest, MakesItsDirectory) { EXPECT_TRUE(fs::is_directory(notifications)); }

TEST_F(InotifyNotificationServiceTest, AFileThatSomebodyWritesIsAPost) {
  const Token token = registerName(kName);
  std::ofstream(file()) << "1\n";
  EXPECT_TRUE(waitForMoreThan(0, token));
  EXPECT_EQ(service.state(token), 1U);
}

TEST_F(InotifyNotificationServiceTest, AFileThatIsLinkedOrRenamedIntoPlaceIsAPost) {
  const Token token = registerName(kName);
  std::ofstream(directory.path("made")) << "7\n";
  fs::create_hard_link(directory.path("made"), file());
  EXPECT_TRUE(waitForMoreThan(0, token));
  EXPECT_EQ(service.state(token), 7U);
  const int before = count(token);
  std::ofstream(directory.path("next")) << "8\n";
  fs::rename(directory.path("next"), file());
  EXPECT_TRUE(waitForMoreThan(before, token));
  EXPECT_EQ(service.state(token), 8U);
}

TEST_F(InotifyNotificationServiceTest, AFileThatIsNoNumberOrTooLargeHasNoState) {
  const Token token = registerName(kName);
  std::ofstream(file()) << "loud";
  EXPECT_EQ(service.state(token), std::nullopt);
  std::ofstream(file()) << std::string(1 << 20, '1');
  EXPECT_EQ(service.state(token), std::nullopt);
  std::ofstream(file()) << "2";
  EXPECT_EQ(service.state(token), 2U);
}

TEST_F(InotifyNotificationServiceTest, ARemovedFilesStateIsZero) {
  const Token token = registerName(kName);
  std::ofstream(file()) << "5";
  EXPECT_EQ(service.state(token), 5U);
  fs::remove(file());
  EXPECT_EQ(service.state(token), 0U);
}

TEST_F(InotifyNotificationServiceTest, EveryHandlerIsCalledWhenTheDirectoryIsReplaced) {
  const Token first = registerName(kName);
  const Token second = registerName("com.orvane.test.other");
  fs::rename(notifications, directory.path("away"));
  EXPECT_TRUE(waitForMoreThan(0, first));
  EXPECT_TRUE(waitForMoreThan(0, second));
  const int before = count(first);
  EXPECT_FALSE(service.post(kName));  // creates the directory again
  EXPECT_TRUE(waitForMoreThan(before, first));
  EXPECT_EQ(service.state(first), 0U);
}

TEST_F(InotifyNotificationServiceTest, FilesWithoutARegistrationChangeNothing) {
  const Token token = registerName(kName);
  for (int at = 0; at < 200; ++at) std::ofstream(file("other-" + std::to_string(at))) << at;
  EXPECT_FALSE(service.post(kName));
  EXPECT_TRUE(waitForMoreThan(0, token));
  queue.drain();
  EXPECT_EQ(count(token), 1);
}

// Somebody wrote a state 60,000 times a second, and every session had a row of each.
TEST_F(InotifyNotificationServiceTest, ANameThatIsRewrittenAllTheTimeIsToldOnceAnInterval) {
  const Token token = registerName(kName);
  const auto begin = std::chrono::steady_clock::now();
  const auto end = begin + 5 * NotificationPace::kInterval;
  std::uint64_t state = 0;
  while (std::chrono::steady_clock::now() < end) std::ofstream(file()) << ++state << '\n';
  std::ofstream(file()) << "41\n";
  EXPECT_TRUE(waitForMoreThan(count(token), token));  // the last post
  EXPECT_EQ(service.state(token), 41U);
  const auto passed = std::chrono::steady_clock::now() - begin;
  EXPECT_LE(count(token), passed / NotificationPace::kInterval + 2);
  EXPECT_GT(state, 20U);
}

TEST(InotifyNotificationServiceWithoutDirectoryTest, WorksAfterTheDirectoryIsCreated) {
  const TemporaryDirectory directory;
  std::ofstream(directory.path("runtime")) << "a file in the way";
  MemoryLog log;
  const LogCategory category(log, "com.orvane.tonewerk", "twrs");
  ThreadQueue queue("test", QueuePriority::kUtility);
  std::mutex mutex;
  std::condition_variable changed;
  bool isCalled = false;
  TimerThread timers;
  InotifyNotificationService service(directory.path("runtime/notifications"), timers, category);
  const auto registration = service.registerHandler(kName, queue, [&](Token) {
    {
      const std::lock_guard lock(mutex);
      isCalled = true;
    }
    changed.notify_all();
  });
  EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  EXPECT_TRUE(service.post(kName));
  EXPECT_EQ(service.state(registration.token), std::nullopt);
  fs::remove(directory.path("runtime"));
  EXPECT_FALSE(service.post(kName));
  EXPECT_EQ(service.state(registration.token), 0U);
  std::unique_lock lock(mutex);
  EXPECT_TRUE(changed.wait_for(lock, std::chrono::seconds(20), [&] { return isCalled; }));
}

}  // namespace
}  // namespace tonewerk
