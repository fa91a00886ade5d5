// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <system_error>

#include "tools/recording/Recording.h"
#include "tools/twctl/DaemonCalls.h"

namespace tonewerk {

// Plays a recording to a daemon, on one connection for each of its clients, and waits for the answers. What
// the recording says of the clients' users and processes and of the device is left out, because the daemon
// has its own. Where the recording's daemon begins again, the connections end.
class RecordingPlayer {
 public:
  // Called for each request that was refused, with the call and the reason.
  using Refusal = std::function<void(const RecordedStep& call, const std::string& why)>;
  // Returns a connection; null on a failure, which it has told the user.
  using Connect = std::function<std::unique_ptr<DaemonCalls>()>;

  // `speed` is above 0; 1 plays as recorded, infinity without pauses.
  RecordingPlayer(Connect connect, double speed, Refusal refusal);

  // Connects the first client, whether or not the recording has one. Then waits until every request is sent
  // and answered, or a connection ends, which is no error after a request that ends the daemon. Does not wait
  // for a start's answer, because it only comes when the session stops. std::errc::not_connected when
  // `connect` has failed.
  [[nodiscard]] std::error_code play(const Recording& recording);

  std::size_t refused() const { return refused_; }

 private:
  struct Client {
    std::unique_ptr<DaemonCalls> daemon;
    // Shared with the handlers of answers, which may outlive the client.
    std::shared_ptr<std::size_t> unanswered = std::make_shared<std::size_t>(0);
  };

  [[nodiscard]] std::error_code connect(std::int64_t client);
  [[nodiscard]] std::error_code take(const RecordedStep& step);
  [[nodiscard]] std::error_code disconnect(std::int64_t client);
  [[nodiscard]] std::error_code disconnectAll();
  [[nodiscard]] std::error_code waitUntil(std::chrono::steady_clock::time_point time);
  // Until `isDone`, or until no answer can be expected any more.
  [[nodiscard]] std::error_code waitForAnswers(const std::function<bool()>& isDone);
  // Waits for answers on any connection, and takes those that have arrived.
  [[nodiscard]] std::error_code processAnswers(std::chrono::milliseconds timeout);
  [[nodiscard]] std::error_code send(const RecordedStep& call);
  void refuse(const RecordedStep& call, const std::string& why);
  bool isAnswered() const;

  const Connect connect_;
  const double speed_;
  const Refusal refusal_;
  std::map<std::int64_t, Client> clients_;
  std::size_t refused_ = 0;
  bool endsDaemon_ = false;
};

}  // namespace tonewerk
