// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <deque>
#include <map>
#include <nlohmann/json.hpp>
#include <string>
#include <thread>
#include <vector>

#include "values/Mutex.h"

namespace tonewerk {

// An OTLP/HTTP endpoint on the loopback interface that accepts only correct requests and fails when a test
// asks for it.
//
//   OtlpReceiver receiver;
//   receiver.answerNext({.status = 503, .headers = {"Retry-After: 1"}});
//   ...
//   ASSERT_TRUE(receiver.waitForRequests(2));
//   EXPECT_THAT(receiver.problems(), IsEmpty());
//
// It serves one connection at a time and one request for each connection. Any thread.
class OtlpReceiver {
 public:
  enum class Fault {
    kNone,
    kHang,        // reads the request and sends nothing until the peer closes
    kGarbage,     // sends bytes that are not HTTP
    kHugeBody,    // sends a body of 100 MB
    kHugeHeader,  // sends a header of 100 MB
    kCutBody,     // announces a longer body than it sends
    kCloseEarly,  // closes without an answer
  };
  struct Answer {
    int status = 200;
    std::vector<std::string> headers = {};
    std::string body = "{}";
    Fault fault = Fault::kNone;
  };
  struct Request {
    std::string line;
    std::map<std::string, std::string> headers;  // names in lower case
    std::string body;                            // unpacked

    nlohmann::json json() const { return nlohmann::json::parse(body, nullptr, false); }
  };

  OtlpReceiver();
  OtlpReceiver(const OtlpReceiver&) = delete;
  OtlpReceiver& operator=(const OtlpReceiver&) = delete;
  ~OtlpReceiver();

  // "http://127.0.0.1:PORT".
  std::string address() const;
  // Returns an address on which nobody listens.
  static std::string deadAddress();

  // Answers the next requests with these, in order; later ones get the usual 200.
  void answerNext(Answer answer);

  // Waits until `count` requests arrived, at most some seconds. Returns false when there were fewer.
  [[nodiscard]] bool waitForRequests(std::size_t count);
  std::vector<Request> requests() const;
  // Returns the log records of all requests, accepted or not.
  std::vector<nlohmann::json> records() const;
  // Returns what is wrong with the requests, by the rules of the transport and of the schema.
  std::vector<std::string> problems() const;

 private:
  void run();
  void serve(int connection);
  [[nodiscard]] bool readRequest(int connection, Request& request);
  void check(Request& request);
  void send(int connection, const Answer& answer);
  void sendForever(int connection, const std::string& beginning);
  void waitForPeer(int connection);
  [[nodiscard]] bool waitReadable(int descriptor);

  int listener_ = -1;
  int port_ = 0;
  int wakeRead_ = -1;
  int wakeWrite_ = -1;

  mutable Mutex mutex_;
  Condition arrived_;
  std::deque<Answer> answers_ GUARDED_BY(mutex_);
  std::vector<Request> requests_ GUARDED_BY(mutex_);
  std::vector<std::string> problems_ GUARDED_BY(mutex_);

  std::thread thread_;  // last, because it uses all members above
};

}  // namespace tonewerk
