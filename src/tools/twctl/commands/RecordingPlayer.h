// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <string>
#include <system_error>

#include "tools/twctl/DaemonConnection.h"
#include "tools/twctl/input/Recording.h"

namespace tonewerk {

// Plays a recording on one connection, which takes what the answers are.
class RecordingPlayer {
 public:
  // Told of each request that was refused: its line in the recording and why.
  using Refusal = std::function<void(const RecordedCall& call, const std::string& why)>;

  // `speed` is above 0; 1 is as recorded, infinity without pauses. `daemon` is connected and outlives the
  // player.
  RecordingPlayer(DaemonConnection& daemon, double speed, Refusal refusal);

  // Waits until every request is sent and answered, or the daemon is gone: no error after a request that ends
  // it. A start's answer is not waited for: it only comes with the session's stop.
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
