// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "client/ClientRegistry.h"
#include "client/ScriptedServer.h"
#include "client/TestPayload.h"
#include "support/TemporaryDirectory.h"
#include "tonewerk/reporting.h"
#include "values/Mutex.h"

namespace tonewerk {

// Collects a client's callbacks, so that a test on another thread can wait for them.
//
//   twr_session_start(session, AnswerLog::note, log.as("stopped"));
//   EXPECT_EQ(log.next(), "stopped: done");
class AnswerLog {
 public:
  // Makes a callback's context, whose name marks its answers. Valid as long as this object.
  void* as(std::string name, std::function<void(const twr_answer&)> also = nullptr) {
    const MutexLock lock(mutex_);
    names_.push_back({this, std::move(name), std::move(also)});
    return &names_.back();
  }
  static void note(void* context, const twr_answer* answer) {
    const Name& name = *static_cast<Name*>(context);
    if (name.also) name.also(*answer);
    name.log->add(name.text + ": " + twr_status_text(answer->status));
  }
  static void noteState(void* context, twr_state state) {
    static_cast<AnswerLog*>(context)->add("state " + std::to_string(state));
  }

  // Waits for the next answer; a test failure when none comes.
  std::string next() {
    const auto until = std::chrono::steady_clock::now() + std::chrono::milliseconds(kScriptPatienceMs);
    MutexLock lock(mutex_);
    while (taken_ == answers_.size() && changed_.waitUntil(lock, until)) {
    }
    const bool isThere = taken_ < answers_.size();
    EXPECT_TRUE(isThere) << "no answer";
    return isThere ? answers_[taken_++] : std::string();
  }
  std::vector<std::string> rest() {
    const MutexLock lock(mutex_);
    std::vector<std::string> rest(answers_.begin() + static_cast<std::ptrdiff_t>(taken_), answers_.end());
    taken_ = answers_.size();
    return rest;
  }
  void add(std::string answer) {
    const MutexLock lock(mutex_);
    answers_.push_back(std::move(answer));
    changed_.notifyAll();
  }

 private:
  struct Name {
    AnswerLog* log;
    std::string text;
    std::function<void(const twr_answer&)> also;
  };

  Mutex mutex_;
  Condition changed_;
  std::vector<std::string> answers_ GUARDED_BY(mutex_);
  std::size_t taken_ GUARDED_BY(mutex_) = 0;
  std::deque<Name> names_ GUARDED_BY(mutex_);
};

// Runs a client with short delays against a scripted daemon, through the C interface.
class ClientTest : public testing::Test {
 public:
  ~ClientTest() override { twr_client_destroy(client, 0); }

 protected:
  static ClientSettings settings(const std::string& path) {
    ClientSettings chosen;
    chosen.socketPaths = {path};
    chosen.firstDelay = std::chrono::milliseconds(1);
    chosen.maxDelay = std::chrono::milliseconds(4);
    chosen.busyPoll = std::chrono::milliseconds(1);
    chosen.idlePoll = std::chrono::milliseconds(1);
    return chosen;
  }
  void makeClientWith(ClientSettings chosen) {
    twr_client_destroy(client, 0);
    client = makeClient(std::move(chosen));
    ASSERT_NE(client, nullptr);
  }
  void destroyClient(int timeout = kScriptPatienceMs) {
    twr_client_destroy(std::exchange(client, nullptr), timeout);
  }
  // Makes the session 77, and returns the connection on which it was created.
  std::unique_ptr<ScriptedConnection> connectWithSession() {
    session = twr_session_create(client, 77);
    auto connection = daemon->accept();
    if (connection != nullptr) {
      EXPECT_EQ(connection->nextText(), "createReportingSession 77");
    }
    return connection;
  }
  twr_status send(std::int64_t number, twr_reply reply = nullptr, void* context = nullptr) {
    TestPayload payload;
    twr_put_int(payload.get(), "number", number);
    twr_put_double(payload.get(), "twreporting_timestamp", 1.5);
    return twr_session_send(session, TWR_CATEGORY_VOLUME, TWR_TYPE_GENERIC, payload.get(), reply, context);
  }
  // Makes the session 77 and sends 0, 1, 2 ... until the queue has refused two. Returns how many it took.
  int fillQueue() {
    session = twr_session_create(client, 77);
    int taken = 0;
    while (send(taken) == TWR_OK) ++taken;
    EXPECT_EQ(send(4711), TWR_FULL);
    return taken;
  }
  twr_client_info info() {
    twr_client_info known{};
    known.size = sizeof(known);
    EXPECT_EQ(twr_client_get_info(client, &known), TWR_OK);
    return known;
  }
  // The text of the frame that send(number) makes.
  static std::string message(int number, const std::string& more = "") {
    return "sendMessage {\"number\":" + std::to_string(number) + ",\"twreporting_timestamp\":1.5" + more +
           "} 14 0 [77]";
  }

  TemporaryDirectory directory;
  const std::string path = directory.path("reporting.sock");
  std::unique_ptr<ScriptedServer> daemon = std::make_unique<ScriptedServer>(path);
  AnswerLog log;
  twr_client* client = makeClient(settings(path));
  twr_session* session = nullptr;
};

}  // namespace tonewerk
