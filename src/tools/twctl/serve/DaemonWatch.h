// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "tools/twctl/DaemonConnection.h"
#include "tools/twctl/serve/LiveSessions.h"

namespace tonewerk {

// Follows what the daemon's sessions play: connects, lets itself be told of messages, and lists the sessions
// again and again. When the daemon goes or does not answer, it says so and tries again. Used by one thread,
// which calls proceed() whenever the descriptor is readable or the time of nextStep() has come. Only a
// connection that is being made, for at most 10 s, makes it wait.
class DaemonWatch {
 public:
  using Time = std::chrono::steady_clock::time_point;

  static constexpr std::chrono::milliseconds kListingPause{500};
  static constexpr std::chrono::seconds kRetryPause{1};
  // Without an answer for so long, the daemon counts as one that does not answer.
  static constexpr std::chrono::seconds kPatience{5};

  // `paths` are those of the daemon's socket, see Tool::socketPaths(). `clock` is the one of the times that
  // proceed() gets.
  explicit DaemonWatch(std::vector<std::string> paths,
                       std::function<Time()> clock = std::chrono::steady_clock::now)
      : paths_(std::move(paths)), clock_(std::move(clock)) {}

  // -1 without a connection.
  int fileDescriptor() const { return connection_ ? connection_->fileDescriptor() : -1; }
  Time nextStep() const;

  // Does what is due. `now` is the time in seconds since 1970.
  void proceed(Time time, double now);

  // False until it is known whether the daemon answers.
  bool hasAsked() const { return hasAsked_; }
  bool answers() const { return hasAsked_ && problem_.empty(); }
  // What is wrong, in a sentence for people; empty when the daemon answers, and before it is known.
  const std::string& problem() const { return problem_; }
  const LiveSessions& sessions() const { return sessions_; }
  // Adds what the store has of the sessions that run, see LiveSessions::remember().
  void remember(const ValueMap& rows) { sessions_.remember(rows, watchedSince_); }
  // Of how many connections the sessions were listed.
  std::uint64_t connections() const { return connections_; }
  // How many messages the daemon could not keep for this watcher.
  std::int64_t missed() const { return missed_; }

 private:
  void connect(Time time);
  void ask(std::string_view method, const Arguments& arguments,
           const std::function<void(const Value& result)>& take);
  void askForMessages();
  void askForSessions(std::size_t first);
  void takeMessages(const Value& result);
  void takeSessions(const Value& result);
  void fail(std::string problem, Time time);

  const std::vector<std::string> paths_;
  const std::function<Time()> clock_;
  LiveSessions sessions_;
  bool hasAsked_ = false;
  std::string problem_;
  std::int64_t missed_ = 0;
  Time time_;                    // of the current step
  double now_ = 0.0;             // likewise, in seconds since 1970
  Time dueAt_;                   // the next connection or listing
  std::optional<Time> askedAt_;  // since when an answer to the listing is awaited
  Time listingFrom_;             // when its first portion was asked for
  std::error_code failure_;      // of a request of this step
  std::string refusal_;
  bool hasListed_ = false;  // on this connection
  double watchedSince_ = 0.0;
  std::uint64_t connections_ = 0;
  std::vector<ValueMap> listing_;
  std::unique_ptr<DaemonConnection> connection_;
};

}  // namespace tonewerk
