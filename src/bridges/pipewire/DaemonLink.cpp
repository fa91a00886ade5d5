// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/DaemonLink.h"

#include <utility>

namespace tonewerk {

using std::chrono::milliseconds;

DaemonLink::DaemonLink(EventLoop& loop, const Diagnostics& diagnostics, std::vector<std::string> paths)
    : loop_(loop),
      diagnostics_(diagnostics),
      paths_(std::move(paths)),
      retryTimer_(loop.makeTimer([this] { connect(); })) {
  client_.setSendTimeout(kSendTimeout);
}

void DaemonLink::open(std::function<void()> onConnected) {
  onConnected_ = std::move(onConnected);
  connect();
}

bool DaemonLink::finish(milliseconds timeout) {
  if (!client_.isConnected()) return false;
  // Requests are served in their order, so that any answer to this one says that all before it are done. And
  // their answers have been read: closing a socket with unread bytes would break it for what the daemon has
  // yet to read.
  std::error_code error;
  return client_.call("getAllReporters", {}, timeout, error).has_value();
}

void DaemonLink::create(std::int64_t reporterID) { request("createReportingSession", {Value(reporterID)}); }

void DaemonLink::configure(std::int64_t reporterID, std::uint16_t serviceType,
                           const ValueMap& configuration) {
  // The service type first: changing that of a configured session would make a new one.
  request("setServiceType", {Value(serviceType), Value(reporterID)});
  request("setConfiguration", {Value(configuration), Value(reporterID)});
}

void DaemonLink::start(std::int64_t reporterID) {
  // Its answer comes with the stop. As a request each live session would keep a handler waiting.
  if (!client_.isConnected()) return;
  const std::error_code error = client_.notify("startReportingSessionForID", {Value(reporterID)});
  if (error) lost(error);
}

void DaemonLink::message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
                         ValueMap message) {
  if (diagnostics_.isVerbose()) {
    diagnostics_.detail("session " + std::to_string(reporterID) + ": " + message.text());
  }
  request("sendMessage", ReportingClient::messageArguments(std::move(message), category, type, {reporterID}));
}

void DaemonLink::stop(std::int64_t reporterID) { request("stopReportingSessionForID", {Value(reporterID)}); }

void DaemonLink::destroy(std::int64_t reporterID) { request("destroyReportingSession", {Value(reporterID)}); }

void DaemonLink::connect() {
  const std::error_code error = client_.connect(paths_);
  if (error) {
    if (!std::exchange(saidAbsent_, true)) {
      diagnostics_.say("no reporting daemon (" + error.message() + "), trying on");
    }
    retryTimer_->arm(retryDelay_.next());
    return;
  }
  answers_ = loop_.watch(client_.fileDescriptor(), [this] { processAnswers(); });
  if (answers_ == nullptr) return lost(std::make_error_code(std::errc::not_enough_memory));
  saidAbsent_ = false;
  lastRefusal_.clear();
  diagnostics_.say("connected to the reporting daemon");
  onConnected_();
}

void DaemonLink::processAnswers() {
  const std::error_code error = client_.processAnswers(milliseconds(0));
  if (error) return lost(error);
  // An answer proves that the daemon serves. A connection alone does not: one that it refuses breaks at once,
  // and must not be made again at once for ever.
  retryDelay_.reset();
}

void DaemonLink::request(const char* method, const Arguments& arguments) {
  if (!client_.isConnected()) return;
  const std::error_code error = client_.request(method, arguments, [this, method](const Answer& answer) {
    if (answer.error) reportRefusal(method, *answer.error);
  });
  if (error) lost(error);
}

void DaemonLink::reportRefusal(const char* method, const ReplyError& error) {
  std::string refusal = std::string(method) + " refused: " + error.domain + " " + std::to_string(error.code);
  if (!error.message.empty()) refusal += " (" + error.message + ")";
  if (refusal == lastRefusal_) return;
  diagnostics_.say(refusal);
  lastRefusal_ = std::move(refusal);
}

void DaemonLink::lost(const std::error_code& error) {
  // The client may have closed the descriptor already; the loop has then forgotten it by itself.
  answers_.reset();
  client_.disconnect();
  diagnostics_.say("lost the reporting daemon (" + error.message() + ")");
  retryTimer_->arm(retryDelay_.next());
}

}  // namespace tonewerk
