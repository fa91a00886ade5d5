// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "platform/Log.h"
#include "platform/linux/socket/ServerSocket.h"
#include "platform/linux/socket/UnixSocketListener.h"
#include "protocol/Requests.h"
#include "support/TestAccounts.h"
#include "support/memory/MemoryLog.h"
#include "values/Mutex.h"

namespace tonewerk {

// Runs a daemon with the real request set on a real socket. A test sets the answers in advance. Requests
// without a set answer are answered with true; a start and the kill request are not answered.
class ScriptedDaemon {
 public:
  struct Request {
    std::string method;
    Arguments arguments;
  };

  explicit ScriptedDaemon(const std::string& path) {
    std::string problem;
    listener_.emplace(ServerSocket::open(path, problem), category_, accounts_);
    listener_->setDelegate(delegate_);
    listener_->resume();
    ender_ = std::thread([this] { waitForTheEnd(); });
  }
  ScriptedDaemon(const ScriptedDaemon&) = delete;
  ScriptedDaemon& operator=(const ScriptedDaemon&) = delete;
  ~ScriptedDaemon() {
    end();
    ender_.join();
  }

  // To be called before the first request.
  void answer(const std::string& method, Value result) { results_[method] = std::move(result); }
  // Makes the daemon have exactly the sessions with these identifiers, all of the service type 2.
  void setSessions(std::set<std::int64_t> identifiers) { sessions_ = std::move(identifiers); }
  // Makes the daemon end, without an answer, when this method is called.
  void endAt(const std::string& method) { lastMethod_ = method; }
  void keepSilentAbout(const std::string& method) { silences_.insert(method); }
  void refuse(const std::string& method, ReplyError error) { errors_[method] = std::move(error); }

  std::vector<Request> requests() const {
    const MutexLock lock(mutex_);
    return requests_;
  }
  std::vector<Request> requestsFor(const std::string& method) const {
    std::vector<Request> found = requests();
    std::erase_if(found, [&](const Request& request) { return request.method != method; });
    return found;
  }
  // How many connections there have been.
  std::size_t connections() const {
    const MutexLock lock(mutex_);
    return connections_;
  }

 private:
  class Object final : public RequestHandler {
   public:
    explicit Object(ScriptedDaemon& daemon) : daemon_(daemon) {}
    void handleRequest(std::size_t method, Arguments arguments, Reply reply,
                       InFlightToken /*token*/) override {
      daemon_.handle(std::string(requests::all().methods[method].name), std::move(arguments), reply);
    }

   private:
    ScriptedDaemon& daemon_;
  };

  class Delegate final : public MessagingListenerDelegate {
   public:
    explicit Delegate(ScriptedDaemon& daemon) : daemon_(daemon) {}
    bool listenerShouldAcceptNewConnection(MessagingConnection& connection) override {
      daemon_.countConnection();
      connection.setRequestHandler(requests::all(), std::make_shared<Object>(daemon_));
      connection.resume();
      return true;
    }

   private:
    ScriptedDaemon& daemon_;
  };

  void end() {
    const MutexLock lock(mutex_);
    ends_ = true;
    ending_.notifyOne();
  }

  // The kill request arrives on the listener's thread, which cannot shut down the listener.
  void waitForTheEnd() {
    {
      MutexLock lock(mutex_);
      while (!ends_) ending_.wait(lock);
    }
    listener_->shutDown();
  }

  void countConnection() {
    const MutexLock lock(mutex_);
    ++connections_;
  }

  void handle(const std::string& method, Arguments arguments, const Reply& reply) {
    const std::int64_t first = arguments.empty() || !arguments[0] ? 0 : arguments[0]->integer();
    {
      const MutexLock lock(mutex_);
      requests_.push_back({method, std::move(arguments)});
    }
    if (sessions_ && method == "reporterIDValid") {
      const bool isKnown = sessions_->contains(first);
      return reply(std::nullopt,
                   ValueMap{{"reporterID", isKnown ? first : 0}, {"serviceType", isKnown ? 2 : 65535}});
    }
    if (silences_.contains(method)) return;
    if (method == lastMethod_) return end();
    if (errors_.contains(method)) return reply(errors_[method]);
    if (results_.contains(method)) return reply(std::nullopt, results_[method]);
    if (method == "startReportingSessionForID") return;
    if (method == "killService") return end();
    reply(std::nullopt, Value(true));
  }

  MemoryLog log_;
  LogCategory category_{log_, "com.orvane.tonewerk", "twrs"};
  TestAccounts accounts_;
  std::map<std::string, Value> results_;
  std::map<std::string, ReplyError> errors_;
  std::set<std::string> silences_;
  std::string lastMethod_;
  std::optional<std::set<std::int64_t>> sessions_;
  mutable Mutex mutex_;
  Condition ending_;
  std::vector<Request> requests_ GUARDED_BY(mutex_);
  std::size_t connections_ GUARDED_BY(mutex_) = 0;
  bool ends_ GUARDED_BY(mutex_) = false;

  Delegate delegate_{*this};
  std::optional<UnixSocketListener> listener_;
  std::thread ender_;
};

}  // namespace tonewerk
