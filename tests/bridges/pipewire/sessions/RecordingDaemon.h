// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/socket/UnixSocketListener.h"
#include "protocol/Requests.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"
#include "values/Mutex.h"

namespace tonewerk {

// Serves the daemon's request set on a real socket and records the requests, so that a client's test can
// check them. Answers every request with true, except a start, which it never answers.
class RecordingDaemon final : private MessagingListenerDelegate {
 public:
  struct Request {
    std::string method;
    Arguments arguments;
  };

  explicit RecordingDaemon(const std::string& path) {
    std::string problem;
    std::unique_ptr<ServerSocket> socket = ServerSocket::open(path, problem);
    if (socket == nullptr) return;
    listener_ = std::make_unique<UnixSocketListener>(std::move(socket), category_, accounts_);
    listener_->setDelegate(*this);
    listener_->resume();
  }
  RecordingDaemon(const RecordingDaemon&) = delete;
  RecordingDaemon& operator=(const RecordingDaemon&) = delete;
  ~RecordingDaemon() override {
    if (listener_ != nullptr) listener_->shutDown();
  }

  [[nodiscard]] bool isListening() const { return listener_ != nullptr; }

  // Answers every later request but getAllReporters with this error.
  void refuse(ReplyError error) {
    const MutexLock lock(mutex_);
    refusal_ = std::move(error);
  }

  std::vector<Request> requests() const {
    const MutexLock lock(mutex_);
    return requests_;
  }
  std::vector<std::string> methods() const {
    std::vector<std::string> methods;
    for (const Request& request : requests()) methods.push_back(request.method);
    return methods;
  }
  [[nodiscard]] bool waitForRequests(std::size_t count) const {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    MutexLock lock(mutex_);
    while (requests_.size() < count && changed_.waitUntil(lock, deadline)) {
    }
    return requests_.size() >= count;
  }

 private:
  class Handler final : public RequestHandler {
   public:
    explicit Handler(RecordingDaemon& daemon) : daemon_(daemon) {}
    void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken) override {
      daemon_.handle(method, std::move(arguments), reply);
    }

   private:
    RecordingDaemon& daemon_;
  };

  static const RequestSet& requestSet() { return requests::all(); }

  bool listenerShouldAcceptNewConnection(MessagingConnection& connection) override {
    connection.setRequestHandler(requestSet(), std::make_shared<Handler>(*this));
    connection.resume();
    return true;
  }

  void handle(std::size_t method, Arguments arguments, const Reply& reply) {
    const std::string name(requestSet().methods[method].name);
    std::optional<ReplyError> refusal;
    {
      const MutexLock lock(mutex_);
      requests_.push_back({name, std::move(arguments)});
      if (name != "getAllReporters") refusal = refusal_;
      changed_.notifyAll();
    }
    if (refusal) return reply(refusal);
    if (name != "startReportingSessionForID") reply(std::nullopt, Value(true));
  }

  MemoryLog log_;
  const LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  TestAccounts accounts_;
  mutable Mutex mutex_;
  mutable Condition changed_;
  std::vector<Request> requests_ GUARDED_BY(mutex_);
  std::optional<ReplyError> refusal_ GUARDED_BY(mutex_);
  std::unique_ptr<UnixSocketListener> listener_;
};

}  // namespace tonewerk
