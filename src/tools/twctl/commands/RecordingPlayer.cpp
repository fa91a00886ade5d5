// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/RecordingPlayer.h"

#include <algorithm>
#include <utility>

#include "protocol/Requests.h"
#include "tools/twctl/DaemonCalls.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr milliseconds kAnswerTimeout{30'000};
// Bounds a time in the far future, or a speed close to 0, to a value that the clock can represent.
constexpr double kLongestWaitSeconds = 1e9;

double secondsSince1970() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

}  // namespace

RecordingPlayer::RecordingPlayer(DaemonConnection& daemon, double speed, Refusal refusal)
    : daemon_(daemon), speed_(speed), refusal_(std::move(refusal)) {}

std::error_code RecordingPlayer::play(const Recording& recording) {
  const steady_clock::time_point start = steady_clock::now();
  std::error_code error;
  for (const RecordedCall& call : recording.calls()) {
    const std::chrono::duration<double> due(std::min(call.at / speed_, kLongestWaitSeconds));
    error = waitUntil(start + std::chrono::duration_cast<steady_clock::duration>(due));
    if (!error) error = send(call);
    if (error) break;
  }
  if (!error) error = waitForAnswers();
  return endsDaemon_ && error != std::errc::timed_out ? std::error_code() : error;
}

std::error_code RecordingPlayer::waitUntil(steady_clock::time_point time) {
  for (;;) {
    const auto left = std::chrono::ceil<milliseconds>(time - steady_clock::now());
    // Also without a pause, because the daemon stops reading when too many answers are unread.
    const std::error_code error = daemon_.processAnswers(std::max(left, milliseconds::zero()));
    if (error && error != std::errc::timed_out) return error;
    if (left <= milliseconds::zero()) return {};
  }
}

std::error_code RecordingPlayer::waitForAnswers() {
  const steady_clock::time_point end = steady_clock::now() + kAnswerTimeout;
  while (unanswered_ > 0 || endsDaemon_) {
    const auto left = std::chrono::ceil<milliseconds>(end - steady_clock::now());
    if (left <= milliseconds::zero()) return std::make_error_code(std::errc::timed_out);
    const std::error_code error = daemon_.processAnswers(left);
    if (error) return error;
  }
  return {};
}

std::error_code RecordingPlayer::send(const RecordedCall& call) {
  const bool isStart = call.method == requests::kStartReportingSessionForID.name;
  const bool isKill = call.method == requests::kKillService.name;
  endsDaemon_ = endsDaemon_ || isKill;
  const auto answered = [this, &call, isStart](const Answer& answer) {
    if (!isStart) --unanswered_;
    if (answer.error) refuse(call, DaemonCalls::describe(call.method, *answer.error));
  };
  const std::error_code error = daemon_.request(call.method, call.parametersAt(secondsSince1970()), answered);
  if (error == std::errc::message_size || error == std::errc::invalid_argument) {
    refuse(call, call.method + ": " + error.message());
    return {};
  }
  if (!error && !isStart && !isKill) ++unanswered_;
  return error;
}

void RecordingPlayer::refuse(const RecordedCall& call, const std::string& why) {
  ++refused_;
  refusal_(call, why);
}

}  // namespace tonewerk
