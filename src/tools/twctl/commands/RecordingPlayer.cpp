// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/commands/RecordingPlayer.h"

#include <algorithm>
#include <poll.h>
#include <utility>
#include <vector>

#include "protocol/Requests.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr milliseconds kAnswerTimeout{30'000};
constexpr milliseconds kLongestPoll{60'000};
// Bounds a time in the far future, or a speed close to 0, to a value that the clock can represent.
constexpr double kLongestWaitSeconds = 1e9;

double secondsSince1970() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// The number of the first client of the recording.
std::int64_t firstClientOf(const Recording& recording) {
  for (const RecordedStep& step : recording.steps()) {
    if (step.kind != RecordedStep::Kind::kDevice) return step.client;
  }
  return RecordedStep::kFirstClient;
}

}  // namespace

RecordingPlayer::RecordingPlayer(Connect connect, double speed, Refusal refusal)
    : connect_(std::move(connect)), speed_(speed), refusal_(std::move(refusal)) {}

std::error_code RecordingPlayer::play(const Recording& recording) {
  if (const std::error_code error = connect(firstClientOf(recording))) return error;
  const steady_clock::time_point start = steady_clock::now();
  std::error_code error;
  for (const RecordedStep& step : recording.steps()) {
    const std::chrono::duration<double> due(std::min(step.at / speed_, kLongestWaitSeconds));
    error = waitUntil(start + std::chrono::duration_cast<steady_clock::duration>(due));
    if (!error) error = take(step);
    if (error) break;
  }
  if (!error) error = waitForAnswers([this] { return isAnswered() && !endsDaemon_; });
  return endsDaemon_ && error != std::errc::timed_out ? std::error_code() : error;
}

std::error_code RecordingPlayer::take(const RecordedStep& step) {
  switch (step.kind) {
    case RecordedStep::Kind::kCall:
      return send(step);
    case RecordedStep::Kind::kConnect:
      return connect(step.client);
    case RecordedStep::Kind::kDisconnect:
      return disconnect(step.client);
    case RecordedStep::Kind::kRestart:
      return disconnectAll();
    case RecordedStep::Kind::kDevice:
      break;
  }
  return {};
}

std::error_code RecordingPlayer::connect(std::int64_t client) {
  if (clients_.contains(client)) return {};
  std::unique_ptr<DaemonCalls> daemon = connect_();
  if (daemon == nullptr) return std::make_error_code(std::errc::not_connected);
  clients_[client].daemon = std::move(daemon);
  return {};
}

std::error_code RecordingPlayer::disconnect(std::int64_t client) {
  const auto found = clients_.find(client);
  if (found == clients_.end()) return {};
  const auto unanswered = found->second.unanswered;
  const std::error_code error = waitForAnswers([&] { return *unanswered == 0; });
  clients_.erase(client);
  return error;
}

std::error_code RecordingPlayer::disconnectAll() {
  while (!clients_.empty()) {
    if (const std::error_code error = disconnect(clients_.begin()->first)) return error;
  }
  return {};
}

std::error_code RecordingPlayer::waitUntil(steady_clock::time_point time) {
  for (;;) {
    const auto left = std::chrono::ceil<milliseconds>(time - steady_clock::now());
    // Also without a pause, because the daemon stops reading when too many answers are unread.
    if (const std::error_code error = processAnswers(std::max(left, milliseconds::zero()))) return error;
    if (left <= milliseconds::zero()) return {};
  }
}

std::error_code RecordingPlayer::waitForAnswers(const std::function<bool()>& isDone) {
  const steady_clock::time_point end = steady_clock::now() + kAnswerTimeout;
  while (!isDone()) {
    const auto left = std::chrono::ceil<milliseconds>(end - steady_clock::now());
    if (left <= milliseconds::zero()) return std::make_error_code(std::errc::timed_out);
    if (const std::error_code error = processAnswers(left)) return error;
  }
  return {};
}

std::error_code RecordingPlayer::processAnswers(milliseconds timeout) {
  std::vector<pollfd> polled;
  for (const auto& [number, client] : clients_) {
    polled.push_back({client.daemon->client().fileDescriptor(), POLLIN, 0});
  }
  // A failure is one of the connections, too, or a signal, after which the caller waits again.
  (void)::poll(polled.data(), polled.size(), static_cast<int>(std::min(timeout, kLongestPoll).count()));
  for (auto& [number, client] : clients_) {
    if (const std::error_code error = client.daemon->client().processAnswers(milliseconds::zero()))
      return error;
  }
  return {};
}

bool RecordingPlayer::isAnswered() const {
  return std::all_of(clients_.begin(), clients_.end(),
                     [](const auto& entry) { return *entry.second.unanswered == 0; });
}

std::error_code RecordingPlayer::send(const RecordedStep& call) {
  std::error_code error = connect(call.client);
  if (error) return error;
  Client& client = clients_[call.client];
  const bool isStart = call.method == requests::kStartReportingSessionForID.name;
  const bool isKill = call.method == requests::kKillService.name;
  endsDaemon_ = endsDaemon_ || isKill;
  const auto answered = [this, &call, isStart, unanswered = client.unanswered](const Answer& answer) {
    if (!isStart) --*unanswered;
    if (answer.error) refuse(call, DaemonCalls::describe(call.method, *answer.error));
  };
  error = client.daemon->client().request(call.method, call.parametersAt(secondsSince1970()), answered);
  if (error == std::errc::message_size || error == std::errc::invalid_argument) {
    refuse(call, call.method + ": " + error.message());
    return {};
  }
  if (!error && !isStart && !isKill) ++*client.unanswered;
  return error;
}

void RecordingPlayer::refuse(const RecordedStep& call, const std::string& why) {
  ++refused_;
  refusal_(call, why);
}

}  // namespace tonewerk
