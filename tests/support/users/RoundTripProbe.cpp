// SPDX-License-Identifier: Apache-2.0
#include "support/users/RoundTripProbe.h"

#include <algorithm>
#include <stdexcept>
#include <thread>
#include <utility>

#include "support/client/ReportingClient.h"

namespace tonewerk {
namespace {

using Clock = std::chrono::steady_clock;

constexpr int kLongFormAudio = 7;

void open(ReportingClient& client, std::int64_t reporterID) {
  for (const auto& [method, arguments] :
       {std::pair<const char*, Arguments>{"createReportingSession", {Value(reporterID)}},
        {"setServiceType", {Value(kLongFormAudio), Value(reporterID)}},
        {"startReportingSessionForID", {Value(reporterID)}}}) {
    if (const std::error_code error = client.notify(method, arguments)) {
      throw std::runtime_error(std::string(method) + ": " + error.message());
    }
  }
}

// Whether an answer came in time.
bool ask(ReportingClient& client, std::int64_t reporterID, std::chrono::milliseconds patience) {
  std::error_code error;
  const auto answer = client.call("reporterIDValid", {Value(reporterID)}, patience, error);
  if (!answer && error == std::errc::timed_out) return false;
  if (!answer) throw std::runtime_error("reporterIDValid: " + error.message());
  const ValueMap* validity = answer->result ? answer->result->asMap() : nullptr;
  if (validity == nullptr || validity->integer("reporterID") != reporterID) {
    throw std::runtime_error("the session is not valid");
  }
  return true;
}

}  // namespace

RoundTripTimes::RoundTripTimes(std::vector<std::chrono::nanoseconds> times) : times_(std::move(times)) {
  std::sort(times_.begin(), times_.end());
}

double RoundTripTimes::millisecondsWithin(double share) const {
  if (times_.empty()) return 0.0;
  const auto place = static_cast<std::size_t>(share * static_cast<double>(times_.size()));
  return std::chrono::duration<double, std::milli>(times_[std::min(place, times_.size() - 1)]).count();
}

RoundTripTimes probeRoundTrips(const std::string& socketPath, std::int64_t reporterID,
                               const ProbePlan& plan) {
  ReportingClient client;
  if (const std::error_code error = client.connect({socketPath})) {
    throw std::runtime_error("cannot connect: " + error.message());
  }
  open(client, reporterID);
  std::vector<std::chrono::nanoseconds> times;
  times.reserve(static_cast<std::size_t>(plan.duration / plan.interval));
  const Clock::time_point end = Clock::now() + plan.duration;
  bool isAnswered = true;
  for (Clock::time_point due = Clock::now(); isAnswered && due < end;) {
    std::this_thread::sleep_until(due);
    const Clock::time_point sent = Clock::now();
    isAnswered = ask(client, reporterID, plan.patience);
    const Clock::time_point answered = Clock::now();
    // Also those that would have been sent meanwhile.
    for (Clock::time_point asked = sent; asked < answered; asked += plan.interval) {
      times.push_back(answered - asked);
    }
    due = std::max(due + plan.interval, answered);
  }
  return RoundTripTimes(std::move(times));
}

}  // namespace tonewerk
