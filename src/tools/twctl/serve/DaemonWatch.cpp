// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/DaemonWatch.h"

#include <algorithm>
#include <utility>

#include "protocol/Requests.h"
#include "protocol/WatchKeys.h"
#include "tools/twctl/DaemonCalls.h"

namespace tonewerk {
namespace {

// A daemon that refuses will mostly refuse again.
constexpr std::chrono::seconds kRefusedPause{10};
constexpr const char* kNoAnswer = "The daemon does not answer; trying again.";

const ValueArray& arrayOf(const Value& result, const SharedString& key) {
  static const ValueArray kNone;
  const Value* found = result.asMap() == nullptr ? nullptr : result.asMap()->find(key);
  return found == nullptr || found->asArray() == nullptr ? kNone : *found->asArray();
}

}  // namespace

DaemonWatch::Time DaemonWatch::nextStep() const { return askedAt_ ? *askedAt_ + kPatience : dueAt_; }

void DaemonWatch::proceed(Time time, double now) {
  time_ = time;
  now_ = now;
  if (!connection_) {
    if (time >= dueAt_) connect(time);
    return;
  }
  std::error_code error = connection_->processAnswers(std::chrono::milliseconds::zero());
  if (!error && !failure_ && refusal_.empty() && !askedAt_ && time >= dueAt_) askForSessions(0);
  if (!error) error = failure_;
  if (!refusal_.empty()) return fail(refusal_, time + kRefusedPause);
  if (error) return fail(kNoAnswer, time);
  if (!askedAt_ || time < *askedAt_ + kPatience) return;
  // The connection stays: an answer that comes late is an answer.
  hasAsked_ = true;
  problem_ = kNoAnswer;
  askedAt_ = time;
}

void DaemonWatch::connect(Time time) {
  failure_.clear();
  refusal_.clear();
  askedAt_.reset();
  hasListed_ = false;
  watchedSince_ = now_;
  sessions_.forgetEarly();
  auto connection = std::make_unique<DaemonConnection>(DaemonConnection::End::kAtOnce);
  if (connection->connect(paths_)) return fail(kNoAnswer, time);
  connection_ = std::move(connection);
  (void)connection_->request(requests::kObserve.name, {},
                             {});  // an older daemon refuses this and works as before
  ask(requests::kWatchOpenMessages.name, Arguments{std::nullopt, std::nullopt, std::nullopt},
      [this](const Value&) { askForMessages(); });
  askForSessions(0);
  if (failure_) fail(kNoAnswer, time);
}

void DaemonWatch::ask(std::string_view method, const Arguments& arguments,
                      const std::function<void(const Value& result)>& take) {
  const std::error_code error =
      connection_->request(method, arguments, [this, take, name = std::string(method)](const Answer& answer) {
        if (answer.error) {
          refusal_ = "The daemon does not say what runs; trying again. " +
                     DaemonCalls::describe(name, *answer.error);
        } else {
          take(answer.result.value_or(Value()));
        }
      });
  if (error) failure_ = error;
}

void DaemonWatch::askForMessages() {
  ask(requests::kWatchNextMessages.name, {}, [this](const Value& result) { takeMessages(result); });
}

void DaemonWatch::askForSessions(std::size_t first) {
  if (first == 0) {
    listing_.clear();
    listingFrom_ = time_;
  }
  if (!askedAt_) askedAt_ = time_;
  ask(requests::kWatchSessions.name, Arguments{Value(first)},
      [this](const Value& result) { takeSessions(result); });
}

void DaemonWatch::takeMessages(const Value& result) {
  if (result.asMap() != nullptr)
    missed_ += std::max<std::int64_t>(0, result.asMap()->integer(kWatchKeyMissed));
  for (const Value& message : arrayOf(result, kWatchKeyMessages)) {
    if (message.asMap() != nullptr) sessions_.take(*message.asMap(), now_);
  }
  askForMessages();
}

void DaemonWatch::takeSessions(const Value& result) {
  const ValueArray& portion = arrayOf(result, kWatchKeySessions);
  for (const Value& session : portion) {
    if (session.asMap() != nullptr) listing_.push_back(*session.asMap());
  }
  const std::int64_t total = result.asMap() == nullptr ? 0 : result.asMap()->integer(kWatchKeyTotal);
  if (!portion.empty() && listing_.size() < static_cast<std::size_t>(std::max<std::int64_t>(total, 0))) {
    return askForSessions(listing_.size());
  }
  // What was shown before this connection was another daemon's, or is in the store.
  if (!std::exchange(hasListed_, true)) {
    sessions_.forgetSessions();
    ++connections_;
  }
  // The answer may have come after the step began.
  sessions_.list(listing_, now_, {listingFrom_, clock_()});
  listing_.clear();
  askedAt_.reset();
  dueAt_ = time_ + kListingPause;
  hasAsked_ = true;
  problem_.clear();
}

void DaemonWatch::fail(std::string problem, Time time) {
  connection_.reset();
  askedAt_.reset();
  hasAsked_ = true;
  problem_ = std::move(problem);
  dueAt_ = time + kRetryPause;
}

}  // namespace tonewerk
