// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/Messaging.h"
#include "values/Mutex.h"

namespace tonewerk {

// Long enough for the slowest machine. Only a failing test waits this long.
inline constexpr std::chrono::seconds kPatience{30};

// A request that a request handler received.
struct ReceivedRequest {
  std::string method;
  Arguments arguments;
};

// One method for every parameter type, and some that answer in special ways.
inline const RequestSet& rigInterface() {
  constexpr Parameter kNumber{"number", ParameterType::kInt64};
  constexpr Parameter kMap{"map", ParameterType::kMap};
  constexpr Result kAnswer{ResultType::kAny, "answer"};
  static const RequestSet interface {
    {
      {"takeInt64", {kNumber}}, {"takeUInt32", {{"number", ParameterType::kUInt32}}},
          {"takeUInt16", {{"number", ParameterType::kUInt16}}}, {"takeMap", {kMap}},
          {"takeList", {{"list", ParameterType::kInt64ListOrNone}}}, {"takeTwo", {kMap, kNumber}},
          {"echo", {kMap}, kAnswer},                         // answers with the map
          {"answerTwice", {}, kAnswer},                      // 1, then 2
          {"fail", {}},                                      // an error
          {"hold", {kNumber}, kAnswer},                      // keeps the token and the reply
          {"holdReply", {kNumber}, kAnswer},                 // keeps the reply only
          {"holdMap", {kMap}, kAnswer},                      // keeps the token and the reply
          {"holdLarge", {}, kAnswer, std::size_t{1} << 20},  // keeps both; its answer may have up to 1 MiB
          {"takeFromOwner", {kNumber}, {}, 0, true},         // for trusted users
          {"watch", {kNumber}, {}, 0, false, false, false, true},  // for the socket only
    }
  };
  return interface;
}

// Records events and requests of connections, so that a test on another thread can wait for them and check
// them.
class MessagingRecord {
 public:
  void add(std::string event) {
    const MutexLock lock(mutex_);
    events_.push_back(std::move(event));
    changed_.notifyAll();
  }
  void add(ReceivedRequest request) {
    const MutexLock lock(mutex_);
    requests_.push_back(std::move(request));
    changed_.notifyAll();
  }
  void hold(Reply reply, InFlightToken token) {
    const MutexLock lock(mutex_);
    held_.emplace_back(std::move(reply), std::move(token));
    changed_.notifyAll();
  }

  std::vector<std::string> events() const {
    const MutexLock lock(mutex_);
    return events_;
  }
  std::vector<ReceivedRequest> requests() const {
    const MutexLock lock(mutex_);
    return requests_;
  }
  std::size_t heldCount() const {
    const MutexLock lock(mutex_);
    return held_.size();
  }
  // Takes out the replies and tokens that the hold methods have kept.
  std::vector<std::pair<Reply, InFlightToken>> takeHeld() {
    const MutexLock lock(mutex_);
    return std::exchange(held_, {});
  }

  [[nodiscard]] bool waitForEvents(std::size_t count) const {
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    MutexLock lock(mutex_);
    while (events_.size() < count && changed_.waitUntil(lock, deadline)) {
    }
    return events_.size() >= count;
  }
  [[nodiscard]] bool waitForRequests(std::size_t count) const {
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    MutexLock lock(mutex_);
    while (requests_.size() < count && changed_.waitUntil(lock, deadline)) {
    }
    return requests_.size() >= count;
  }
  [[nodiscard]] bool waitForHeld(std::size_t count) const {
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    MutexLock lock(mutex_);
    while (held_.size() < count && changed_.waitUntil(lock, deadline)) {
    }
    return held_.size() >= count;
  }

 private:
  mutable Mutex mutex_;
  mutable Condition changed_;
  std::vector<std::string> events_ GUARDED_BY(mutex_);
  std::vector<ReceivedRequest> requests_ GUARDED_BY(mutex_);
  std::vector<std::pair<Reply, InFlightToken>> held_ GUARDED_BY(mutex_);
};

class RigObject final : public RequestHandler {
 public:
  explicit RigObject(MessagingRecord& record) : record_(record) {}
  RigObject(const RigObject&) = delete;
  RigObject& operator=(const RigObject&) = delete;
  ~RigObject() override { record_.add("object gone"); }

  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) override {
    const std::string name(rigInterface().methods[method].name);
    const Argument first = arguments.empty() ? Argument() : arguments.front();
    record_.add(ReceivedRequest{name, std::move(arguments)});
    if (name == "echo") return reply(std::nullopt, first);
    if (name == "fail") return reply(ReplyError{"com.example", 7, ""});
    if (name == "hold" || name == "holdMap" || name == "holdLarge")
      return record_.hold(std::move(reply), std::move(token));
    if (name == "holdReply") return record_.hold(std::move(reply), InFlightToken());
    if (name != "answerTwice") return reply(std::nullopt);
    reply(std::nullopt, Value(1));
    reply(std::nullopt, Value(2));
  }

 private:
  MessagingRecord& record_;
};

// Accepts every client and exports a RigObject to it, while `rejectsClients` is false.
class RigDelegate final : public MessagingListenerDelegate {
 public:
  explicit RigDelegate(MessagingRecord& record) : record_(record) {}

  bool listenerShouldAcceptNewConnection(MessagingConnection& connection) override {
    if (rejectsClients) {
      record_.add("turned away");
      return false;
    }
    lastProcessIdentifier = connection.processIdentifier();
    lastUserIdentifier = connection.userIdentifier();
    connection.setRequestHandler(rigInterface(), std::make_shared<RigObject>(record_));
    connection.setInterruptionHandler([this] { record_.add("interrupted"); });
    connection.setInvalidationHandler([this] { record_.add("invalidated"); });
    connection.resume();
    record_.add("accepted");
    return true;
  }

  std::atomic<bool> rejectsClients = false;
  std::atomic<std::int32_t> lastProcessIdentifier = 0;
  std::atomic<std::uint32_t> lastUserIdentifier = kNoUser;

 private:
  MessagingRecord& record_;
};

}  // namespace tonewerk
