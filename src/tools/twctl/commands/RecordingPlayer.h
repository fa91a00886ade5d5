// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <string>
#include <system_error>

#include "tools/recording/Recording.h"
#include "tools/twctl/DaemonConnection.h"

namespace tonewerk {

// Plays a recording on one connection and waits for the answers.
class RecordingPlayer {
 public:
  // Called for each request that was refused, with the call and the reason.
  using Refusal = std::function<void(const RecordedCall& call, const std::string& why)>;

  // `speed` is above 0; 1 plays as recorded, infinity without pauses. `daemon` is connected and outlives the
  // player.
  RecordingPlayer(DaemonConnection& daemon, double speed, Refusal refusal);

  // Waits until every request is sent and answered, or the connection ends, which is no error after a request
  // that ends the daemon. Does not wait for a start's answer, because it only comes when the session stops.
  [[nodiscard]] std::error_code play(const Recording& recording);

  std::size_t refused() const { return refused_; }

 private:
  [[nodiscard]] std::error_code waitUntil(std::chrono::steady_clock::time_point time);
  [[nodiscard]] std::error_code waitForAnswers();
  [[nodiscard]] std::error_code send(const RecordedCall& call);
  void refuse(const RecordedCall& call, const std::string& why);

  DaemonConnection& daemon_;
  const double speed_;
  const Refusal refusal_;
  std::size_t unanswered_ = 0;
  std::size_t refused_ = 0;
  bool endsDaemon_ = false;
};

}  // namespace tonewerk
