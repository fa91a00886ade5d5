// SPDX-License-Identifier: Apache-2.0
#include <chrono>
#include <condition_variable>
#include <functional>
#include <future>
#include <gtest/gtest.h>
#include <limits>
#include <memory>
#include <mutex>
#include <string>
#include <utility>

#include "platform/linux/notifications/InotifyNotificationService.h"
#include "platform/linux/notifications/NotificationFiles.h"
#include "platform/linux/threads/ThreadQueue.h"
#include "platform/linux/threads/TimerThread.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryNotificationService.h"

namespace tonewerk {
namespace {

using Token = NotificationService::Token;

constexpr char kName[] = "com.orvane.test.changed";
constexpr char kOther[] = "com.orvane.test.other";
constexpr std::chrono::seconds kTimeout{20};

struct OnFiles {
  TemporaryDirectory directory;
  MemoryLog log;
  LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  TimerThread timers;
  InotifyNotificationService service{directory.path("notifications"), timers, category};

  std::error_code post(std::string_view name, std::uint64_t state) {
    return NotificationFiles(directory.path("notifications")).post(name, state);
  }
};

struct InMemory {
  MemoryNotificationService service;

  std::error_code post(std::string_view name, std::uint64_t state) { return service.post(name, state); }
};

// The contract of all notification services.
template <typename Kind>
class NotificationServiceContract : public testing::Test {
 protected:
  NotificationService& service() { return kind_.service; }
  std::error_code post(std::string_view name, std::uint64_t state) { return kind_.post(name, state); }

  // Handlers call this to change a value that the test waits for.
  template <typename Change>
  void change(Change change) {
    {
      const std::lock_guard lock(mutex_);
      change();
    }
    changed_.notify_all();
  }

  template <typename Condition>
  bool waitUntil(Condition condition) {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, kTimeout, condition);
  }

  // Counts a handler's calls. Handlers share ownership, because they may still run after the test's body has
  // ended.
  using Count = std::shared_ptr<int>;
  static Count newCount() { return std::make_shared<int>(0); }
  void increase(const Count& count) {
    change([&] { ++*count; });
  }
  int valueOf(const Count& count) {
    const std::lock_guard lock(mutex_);
    return *count;
  }

  // Registers a handler on the test's queue.
  void addHandler(std::string_view name, std::function<void(Token)> handler) {
    const auto registration = service().registerHandler(name, queue_, std::move(handler));
    EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  }
  // Registers a handler that counts.
  Token count(std::string_view name, const Count& calls, SerialQueue& queue) {
    const auto registration =
        service().registerHandler(name, queue, [this, calls](Token) { increase(calls); });
    EXPECT_EQ(registration.status, NotificationService::kStatusOk);
    return registration.token;
  }
  Token count(std::string_view name, const Count& calls) { return count(name, calls, queue_); }

  // Posts and waits until the count has risen.
  void postAndWait(std::string_view name, const Count& calls) {
    const int before = valueOf(calls);
    EXPECT_FALSE(service().post(name));
    EXPECT_TRUE(waitUntil([&] { return *calls > before; }));
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  ThreadQueue queue_{"test", QueuePriority::kUtility};
  ThreadQueue markerQueue_{"witness", QueuePriority::kUtility};
  Kind kind_;  // last: its handlers use the members above
};

using Kinds = testing::Types<OnFiles, InMemory>;
TYPED_TEST_SUITE(NotificationServiceContract, Kinds);

TYPED_TEST(NotificationServiceContract, APostRunsTheHandlerOnItsQueueWithItsToken) {
  const auto calledToken = std::make_shared<Token>(NotificationService::kNoToken);
  const auto onQueue = std::make_shared<bool>(false);
  const auto registration =
      this->service().registerHandler(kName, this->queue_, [this, calledToken, onQueue](Token token) {
        this->change([&] {
          *calledToken = token;
          *onQueue = this->queue_.isCurrent();
        });
      });
  EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  EXPECT_NE(registration.token, NotificationService::kNoToken);
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_TRUE(this->waitUntil([&] { return *calledToken == registration.token && *onQueue; }));
}

TYPED_TEST(NotificationServiceContract, EachHandlerOfANameIsCalled) {
  const auto first = this->newCount();
  const auto second = this->newCount();
  EXPECT_NE(this->count(kName, first), this->count(kName, second));
  EXPECT_FALSE(this->post(kName, 1));
  EXPECT_TRUE(this->waitUntil([&] { return *first > 0 && *second > 0; }));
}

TYPED_TEST(NotificationServiceContract, TheStateIsTheOneLastPosted) {
  const Token token = this->count(kName, this->newCount());
  for (const std::uint64_t state :
       {std::uint64_t{2}, std::uint64_t{0}, std::numeric_limits<std::uint64_t>::max()}) {
    EXPECT_FALSE(this->post(kName, state));
    EXPECT_EQ(this->service().state(token), state);
  }
}

TYPED_TEST(NotificationServiceContract, TheStateIsZeroBeforeTheFirstPost) {
  EXPECT_EQ(this->service().state(this->count(kName, this->newCount())), 0U);
}

TYPED_TEST(NotificationServiceContract, APostKeepsTheState) {
  const auto calls = this->newCount();
  const Token token = this->count(kName, calls);
  this->postAndWait(kName, calls);
  EXPECT_EQ(this->service().state(token), 0U);
  EXPECT_FALSE(this->post(kName, 41));
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_EQ(this->service().state(token), 41U);
}

TYPED_TEST(NotificationServiceContract, ConsecutivePostsEachCallTheHandler) {
  const auto calls = this->newCount();
  this->count(kName, calls);
  for (int post = 0; post < 5; ++post) this->postAndWait(kName, calls);
}

TYPED_TEST(NotificationServiceContract, AHandlerSeesTheStateOfItsPost) {
  const auto seen = std::make_shared<std::optional<std::uint64_t>>();
  this->addHandler(
      kName, [this, seen](Token token) { this->change([&] { *seen = this->service().state(token); }); });
  EXPECT_FALSE(this->post(kName, 7));
  EXPECT_TRUE(this->waitUntil([&] { return *seen == std::optional<std::uint64_t>(7); }));
}

TYPED_TEST(NotificationServiceContract, HandlersOfOtherNamesAreNotCalled) {
  const auto calls = this->newCount();
  const auto others = this->newCount();
  this->count(kName, calls);
  this->count(kOther, others);
  EXPECT_FALSE(this->service().post("com.orvane.test"));
  EXPECT_FALSE(this->service().post("nobody listens"));
  this->postAndWait(kOther, others);
  EXPECT_EQ(this->valueOf(calls), 0);
}

TYPED_TEST(NotificationServiceContract, ACancelledHandlerIsNotCalledAndHasNoState) {
  const auto calls = this->newCount();
  const auto marker = this->newCount();
  const Token token = this->count(kName, calls);
  this->count(kName, marker);
  this->service().cancel(token);
  this->service().cancel(token);
  this->service().cancel(NotificationService::kNoToken);
  this->postAndWait(kName, marker);
  EXPECT_EQ(this->valueOf(calls), 0);
  EXPECT_EQ(this->service().state(token), std::nullopt);
}

TYPED_TEST(NotificationServiceContract, AHandlerMayCancelItsOwnToken) {
  const auto calls = this->newCount();
  const auto marker = this->newCount();
  this->addHandler(kName, [this, calls](Token token) {
    this->service().cancel(token);
    this->increase(calls);
  });
  this->count(kName, marker);
  for (int post = 0; post < 3; ++post) this->postAndWait(kName, marker);
  EXPECT_EQ(this->valueOf(calls), 1);
}

TYPED_TEST(NotificationServiceContract, AQueuedHandlerDoesNotRunAfterItIsCancelled) {
  const auto calls = this->newCount();
  const auto marker = this->newCount();
  const Token token = this->count(kName, calls);
  // Handlers are queued in the order of their registrations. So when this one runs on its own queue, the
  // first one is waiting behind the work below.
  this->count(kName, marker, this->markerQueue_);
  std::promise<void> begun;
  this->queue_.async([&] {
    begun.set_value();
    EXPECT_TRUE(this->waitUntil([&] { return *marker > 0; }));
    this->service().cancel(token);
  });
  begun.get_future().wait();
  EXPECT_FALSE(this->service().post(kName));
  this->queue_.drain();
  EXPECT_EQ(this->valueOf(calls), 0);
}

TYPED_TEST(NotificationServiceContract, AHandlerMayRegisterAndPost) {
  const auto calls = this->newCount();
  this->addHandler(kName, [this, calls](Token token) {
    this->service().cancel(token);
    this->count(kOther, calls);
    EXPECT_FALSE(this->service().post(kOther));
  });
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_TRUE(this->waitUntil([&] { return *calls > 0; }));
}

TYPED_TEST(NotificationServiceContract, APostDuringTheHandlerCallsItAgain) {
  const auto calls = this->newCount();
  this->addHandler(kName, [this, calls](Token) {
    if (this->valueOf(calls) == 0) {
      EXPECT_FALSE(this->service().post(kName));
    }
    this->increase(calls);
  });
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_TRUE(this->waitUntil([&] { return *calls >= 2; }));
}

TYPED_TEST(NotificationServiceContract, NamesThatAreNotFileNamesAreRefused) {
  for (const std::string& name :
       {std::string(), std::string("."), std::string(".."), std::string("a/b"), std::string("../x"),
        std::string("a\0b", 3), std::string("a\nb"), std::string("a\x7F"), std::string(256, 'a')}) {
    const auto registration = this->service().registerHandler(name, this->queue_, [](Token) {});
    EXPECT_EQ(registration.status, NotificationService::kStatusInvalidName) << name;
    EXPECT_EQ(registration.token, NotificationService::kNoToken);
    EXPECT_EQ(this->service().post(name), std::errc::invalid_argument) << name;
    EXPECT_EQ(this->post(name, 1), std::errc::invalid_argument) << name;
  }
}

TYPED_TEST(NotificationServiceContract, TheLongestNameWorks) {
  const std::string name(255, 'a');
  const auto calls = this->newCount();
  const Token token = this->count(name, calls);
  EXPECT_FALSE(this->post(name, 3));
  this->postAndWait(name, calls);
  EXPECT_EQ(this->service().state(token), 3U);
}

TYPED_TEST(NotificationServiceContract, AnUnknownTokenHasNoState) {
  EXPECT_EQ(this->service().state(NotificationService::kNoToken), std::nullopt);
  EXPECT_EQ(this->service().state(12345), std::nullopt);
}

TYPED_TEST(NotificationServiceContract, ManyPostsWaitAsOnePieceOfWork) {
  std::promise<void> release;
  this->queue_.async([released = release.get_future().share()] { released.wait(); });
  const auto calls = this->newCount();
  const auto marker = this->newCount();
  this->count(kName, calls);
  this->count(kOther, marker, this->markerQueue_);
  for (int post = 0; post < 100; ++post) EXPECT_FALSE(this->service().post(kName));
  this->postAndWait(kOther, marker);  // all earlier posts have been handled
  release.set_value();
  this->queue_.drain();
  // Posts that an implementation tells later may come after the release.
  EXPECT_GE(this->valueOf(calls), 1);
  EXPECT_LE(this->valueOf(calls), 2);
}

}  // namespace
}  // namespace tonewerk
