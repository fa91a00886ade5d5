// SPDX-License-Identifier: Apache-2.0
#include <chrono>
#include <condition_variable>
#include <future>
#include <gtest/gtest.h>
#include <limits>
#include <memory>
#include <mutex>
#include <string>

#include "platform/linux/notifications/InotifyNotificationService.h"
#include "platform/linux/notifications/NotificationFiles.h"
#include "platform/linux/threads/ThreadQueue.h"
#include "support/TemporaryDirectory.h"
#include "support/memory/MemoryLog.h"
#include "support/memory/MemoryNotificationService.h"

namespace tonewerk {
namespace {

using Token = NotificationService::Token;

constexpr char kName[] = "com.orvane.test.changed";
constexpr char kOther[] = "com.orvane.test.other";
constexpr std::chrono::seconds kPatience{20};

struct OnFiles {
  TemporaryDirectory directory;
  MemoryLog log;
  LogCategory category{log, "com.orvane.tonewerk", "twrs"};
  InotifyNotificationService service{directory.path("notifications"), category};

  std::error_code post(std::string_view name, std::uint64_t state) {
    return NotificationFiles(directory.path("notifications")).post(name, state);
  }
};

struct InMemory {
  MemoryNotificationService service;

  std::error_code post(std::string_view name, std::uint64_t state) { return service.post(name, state); }
};

// What every notification service does.
template <typename Kind>
class NotificationServiceContract : public testing::Test {
 protected:
  NotificationService& service() { return kind_.service; }
  std::error_code post(std::string_view name, std::uint64_t state) { return kind_.post(name, state); }

  // Called from handlers: changes what the test waits for.
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
    return changed_.wait_for(lock, kPatience, condition);
  }

  // How often a handler was told. Handlers share it, since they may run on when the test's body has ended.
  using Count = std::shared_ptr<int>;
  static Count newCount() { return std::make_shared<int>(0); }
  void increase(const Count& count) {
    change([&] { ++*count; });
  }
  int valueOf(const Count& count) {
    const std::lock_guard lock(mutex_);
    return *count;
  }

  // Registers a handler that counts.
  Token count(std::string_view name, const Count& told, SerialQueue& queue) {
    const auto registration = service().registerHandler(name, queue, [this, told](Token) { increase(told); });
    EXPECT_EQ(registration.status, NotificationService::kStatusOk);
    return registration.token;
  }
  Token count(std::string_view name, const Count& told) { return count(name, told, queue_); }

  // Posts and waits until `told` has risen.
  void postAndWait(std::string_view name, const Count& told) {
    const int before = valueOf(told);
    EXPECT_FALSE(service().post(name));
    EXPECT_TRUE(waitUntil([&] { return *told > before; }));
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  ThreadQueue queue_{"test", QueuePriority::kUtility};
  ThreadQueue witnessQueue_{"witness", QueuePriority::kUtility};
  Kind kind_;  // last: its handlers use the above
};

using Kinds = testing::Types<OnFiles, InMemory>;
TYPED_TEST_SUITE(NotificationServiceContract, Kinds);

TYPED_TEST(NotificationServiceContract, APostRunsTheHandlerOnItsQueueWithItsToken) {
  const auto told = std::make_shared<Token>(NotificationService::kNoToken);
  const auto onQueue = std::make_shared<bool>(false);
  const auto registration =
      this->service().registerHandler(kName, this->queue_, [this, told, onQueue](Token token) {
        this->change([&] {
          *told = token;
          *onQueue = this->queue_.isCurrent();
        });
      });
  EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  EXPECT_NE(registration.token, NotificationService::kNoToken);
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_TRUE(this->waitUntil([&] { return *told == registration.token && *onQueue; }));
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
  const auto told = this->newCount();
  const Token token = this->count(kName, told);
  this->postAndWait(kName, told);
  EXPECT_EQ(this->service().state(token), 0U);
  EXPECT_FALSE(this->post(kName, 41));
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_EQ(this->service().state(token), 41U);
}

TYPED_TEST(NotificationServiceContract, ConsecutivePostsEachCallTheHandler) {
  const auto told = this->newCount();
  this->count(kName, told);
  for (int post = 0; post < 5; ++post) this->postAndWait(kName, told);
}

TYPED_TEST(NotificationServiceContract, AHandlerSeesTheStateOfItsPost) {
  const auto seen = std::make_shared<std::optional<std::uint64_t>>();
  const auto registration = this->service().registerHandler(kName, this->queue_, [this, seen](Token token) {
    this->change([&] { *seen = this->service().state(token); });
  });
  EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  EXPECT_FALSE(this->post(kName, 7));
  EXPECT_TRUE(this->waitUntil([&] { return *seen == std::optional<std::uint64_t>(7); }));
}

TYPED_TEST(NotificationServiceContract, HandlersOfOtherNamesAreNotCalled) {
  const auto told = this->newCount();
  const auto others = this->newCount();
  this->count(kName, told);
  this->count(kOther, others);
  EXPECT_FALSE(this->service().post("com.orvane.test"));
  EXPECT_FALSE(this->service().post("nobody listens"));
  this->postAndWait(kOther, others);
  EXPECT_EQ(this->valueOf(told), 0);
}

TYPED_TEST(NotificationServiceContract, ACancelledHandlerIsNotCalledAndHasNoState) {
  const auto told = this->newCount();
  const auto witness = this->newCount();
  const Token token = this->count(kName, told);
  this->count(kName, witness);
  this->service().cancel(token);
  this->service().cancel(token);
  this->service().cancel(NotificationService::kNoToken);
  this->postAndWait(kName, witness);
  EXPECT_EQ(this->valueOf(told), 0);
  EXPECT_EQ(this->service().state(token), std::nullopt);
}

TYPED_TEST(NotificationServiceContract, AHandlerMayCancelItsOwnToken) {
  const auto told = this->newCount();
  const auto witness = this->newCount();
  const auto registration = this->service().registerHandler(kName, this->queue_, [this, told](Token token) {
    this->service().cancel(token);
    this->increase(told);
  });
  EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  this->count(kName, witness);
  for (int post = 0; post < 3; ++post) this->postAndWait(kName, witness);
  EXPECT_EQ(this->valueOf(told), 1);
}

TYPED_TEST(NotificationServiceContract, AQueuedHandlerDoesNotRunAfterItIsCancelled) {
  const auto told = this->newCount();
  const auto witness = this->newCount();
  const Token token = this->count(kName, told);
  // Handlers are queued in the order of their registrations: when this one runs, on a queue of its own, the
  // first waits behind the piece of work below.
  this->count(kName, witness, this->witnessQueue_);
  std::promise<void> begun;
  this->queue_.async([&] {
    begun.set_value();
    EXPECT_TRUE(this->waitUntil([&] { return *witness > 0; }));
    this->service().cancel(token);
  });
  begun.get_future().wait();
  EXPECT_FALSE(this->service().post(kName));
  this->queue_.drain();
  EXPECT_EQ(this->valueOf(told), 0);
}

TYPED_TEST(NotificationServiceContract, AHandlerMayRegisterAndPost) {
  const auto told = this->newCount();
  const auto registration = this->service().registerHandler(kName, this->queue_, [this, told](Token token) {
    this->service().cancel(token);
    this->count(kOther, told);
    EXPECT_FALSE(this->service().post(kOther));
  });
  EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_TRUE(this->waitUntil([&] { return *told > 0; }));
}

TYPED_TEST(NotificationServiceContract, APostDuringTheHandlerCallsItAgain) {
  const auto told = this->newCount();
  const auto registration = this->service().registerHandler(kName, this->queue_, [this, told](Token) {
    if (this->valueOf(told) == 0) {
      EXPECT_FALSE(this->service().post(kName));
    }
    this->increase(told);
  });
  EXPECT_EQ(registration.status, NotificationService::kStatusOk);
  EXPECT_FALSE(this->service().post(kName));
  EXPECT_TRUE(this->waitUntil([&] { return *told >= 2; }));
}

TYPED_TEST(NotificationServiceContract, NamesThatAreNotFileNamesAreRefused) {
  for (const std::string& name : {std::string(), std::string("."), std::string(".."), std::string("a/b"),
                                  std::string("../x"), std::string("a\0b", 3), std::string(256, 'a')}) {
    const auto registration = this->service().registerHandler(name, this->queue_, [](Token) {});
    EXPECT_EQ(registration.status, NotificationService::kStatusInvalidName) << name;
    EXPECT_EQ(registration.token, NotificationService::kNoToken);
    EXPECT_EQ(this->service().post(name), std::errc::invalid_argument) << name;
    EXPECT_EQ(this->post(name, 1), std::errc::invalid_argument) << name;
  }
}

TYPED_TEST(NotificationServiceContract, TheLongestNameWorks) {
  const std::string name(255, 'a');
  const auto told = this->newCount();
  const Token token = this->count(name, told);
  EXPECT_FALSE(this->post(name, 3));
  this->postAndWait(name, told);
  EXPECT_EQ(this->service().state(token), 3U);
}

TYPED_TEST(NotificationServiceContract, AnUnknownTokenHasNoState) {
  EXPECT_EQ(this->service().state(NotificationService::kNoToken), std::nullopt);
  EXPECT_EQ(this->service().state(12345), std::nullopt);
}

TYPED_TEST(NotificationServiceContract, ManyPostsWaitAsOnePieceOfWork) {
  std::promise<void> release;
  this->queue_.async([released = release.get_future().share()] { released.wait(); });
  const auto told = this->newCount();
  const auto witness = this->newCount();
  this->count(kName, told);
  this->count(kOther, witness, this->witnessQueue_);
  for (int post = 0; post < 100; ++post) EXPECT_FALSE(this->service().post(kName));
  this->postAndWait(kOther, witness);  // all posts before it have been seen
  release.set_value();
  this->queue_.drain();
  EXPECT_EQ(this->valueOf(told), 1);
}

}  // namespace
}  // namespace tonewerk
