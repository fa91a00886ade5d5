// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <future>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/LogCategory.h"
#include "platform/linux/ServerSocket.h"
#include "platform/linux/UnixSocketListener.h"
#include "service/TWReportingServiceExport.h"
#include "support/MemoryLog.h"

namespace tonewerk {

// A daemon with the real request set on a real socket, whose answers a test says beforehand. Requests without
// a scripted answer are answered with true, a start and the kill request with nothing.
class ScriptedDaemon final : private MessagingListenerDelegate {
 public:
  struct Request {
    std::string method;
    Arguments arguments;
  };

  explicit ScriptedDaemon(const std::string& path) {
    std::string problem;
    listener_.emplace(ServerSocket::open(path, problem), category_);
    listener_->setDelegate(*this);
    listener_->resume();
  }
  ScriptedDaemon(const ScriptedDaemon&) = delete;
  ScriptedDaemon& operator=(const ScriptedDaemon&) = delete;
  ~ScriptedDaemon() override {
    if (ended_.valid()) ended_.wait();
    listener_->shutDown();
  }

  // Before the first request.
  void answer(const std::string& method, Value result) { results_[method] = std::move(result); }
  void refuse(const std::string& method, ReplyError error) { errors_[method] = std::move(error); }

  std::vector<Request> requests() const {
    const std::lock_guard lock(mutex_);
    return requests_;
  }

 private:
  class Object final : public ExportedObject {
   public:
    explicit Object(ScriptedDaemon& daemon) : daemon_(daemon) {}
    void handleRequest(std::size_t method, Arguments arguments, Reply reply,
                       RequestToken /*token*/) override {
      daemon_.handle(std::string(TWReportingServiceExport::exportedInterface().methods[method].name),
                     std::move(arguments), reply);
    }

   private:
    ScriptedDaemon& daemon_;
  };

  bool listenerShouldAcceptNewConnection(MessagingConnection& connection) override {
    connection.exportObject(TWReportingServiceExport::exportedInterface(), std::make_shared<Object>(*this));
    connection.resume();
    return true;
  }

  void handle(const std::string& method, Arguments arguments, const Reply& reply) {
    {
      const std::lock_guard lock(mutex_);
      requests_.push_back({method, std::move(arguments)});
    }
    if (errors_.contains(method)) return reply(errors_[method]);
    if (results_.contains(method)) return reply(std::nullopt, results_[method]);
    if (method == "startReportingSessionForID") return;
    if (method == "killService") {
      ended_ = std::async(std::launch::async, [this] { listener_->shutDown(); });
      return;
    }
    reply(std::nullopt, Value(true));
  }

  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  std::map<std::string, Value> results_;
  std::map<std::string, ReplyError> errors_;
  mutable std::mutex mutex_;
  std::vector<Request> requests_;  // guarded by mutex_
  std::optional<UnixSocketListener> listener_;
  std::future<void> ended_;
};

}  // namespace tonewerk
