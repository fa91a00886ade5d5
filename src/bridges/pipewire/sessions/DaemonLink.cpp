// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/sessions/DaemonLink.h"

#include <optional>
#include <system_error>
#include <utility>

#include "client/ValuePayload.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

std::string textOf(int error) { return std::generic_category().message(error); }

// Lets the loop's thread wait for an answer that arrives on the library's thread.
class PendingAnswer {
 public:
  static void answered(void* context, const twr_answer* answer) {
    // This call owns a reference of its own, because the waiting thread may have given up.
    const std::unique_ptr<std::shared_ptr<PendingAnswer>> share(
        static_cast<std::shared_ptr<PendingAnswer>*>(context));
    PendingAnswer& self = **share;
    const MutexLock lock(self.mutex_);
    self.status_ = answer->status;
    self.isAnswered_.notifyAll();
  }

  bool waitForSuccess(milliseconds timeout) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    MutexLock lock(mutex_);
    while (!status_ && isAnswered_.waitUntil(lock, deadline)) {
    }
    return status_ == TWR_OK;
  }

 private:
  Mutex mutex_;
  Condition isAnswered_;
  std::optional<twr_status> status_ GUARDED_BY(mutex_);
};

}  // namespace

// Identifies the request that an answer belongs to, so that a refusal can be reported with its method.
struct DaemonLink::PendingRequest {
  DaemonLink& link;
  const char* method;
};

DaemonLink::DaemonLink(EventLoop& loop, const Console& console, std::string socketPath)
    : console_(console), chosenPath_(std::move(socketPath)), inbox_(loop) {}

DaemonLink::~DaemonLink() { twr_client_destroy(client_, 0); }

bool DaemonLink::open(std::function<void(Connection connection)> onConnected) {
  onConnected_ = std::move(onConnected);
  twr_client_options options{};
  options.size = sizeof(options);
  options.socket_path = chosenPath_.empty() ? nullptr : chosenPath_.c_str();
  options.state_changed = &DaemonLink::stateChanged;
  options.context = this;
  client_ = inbox_.isOpen() ? twr_client_create(&options) : nullptr;
  // A timeout of 0: this starts the connection before the first message, and does not wait for it.
  const twr_status status = twr_client_connect(client_, 0);
  return status == TWR_OK || status == TWR_NOT_CONNECTED || status == TWR_TIMED_OUT;
}

std::string DaemonLink::socketPath() const { return info().socket_path; }

bool DaemonLink::finish(milliseconds timeout) {
  // The daemon serves requests in order, so any answer to this one means that all earlier requests are done.
  // It also means that their answers have been read. Closing a socket with unread answers would discard the
  // requests that the daemon has not read yet.
  const auto answer = std::make_shared<PendingAnswer>();
  auto share = std::make_unique<std::shared_ptr<PendingAnswer>>(answer);
  if (!isConnected_ || twr_client_get_all_reporters(client_, &PendingAnswer::answered, share.get()) != TWR_OK)
    return false;
  static_cast<void>(share.release());
  return answer->waitForSuccess(timeout);
}

void DaemonLink::create(std::int64_t reporterID) {
  if (!wasConnected_) return;
  if (twr_session* made = twr_session_create(client_, reporterID))
    sessions_.insert_or_assign(reporterID, made);
}

void DaemonLink::configure(std::int64_t reporterID, std::uint16_t serviceType,
                           const ValueMap& configuration) {
  // The service type goes first: changing it in a configured session would make the daemon replace the
  // session.
  request("setServiceType", [&](twr_reply reply, void* context) {
    return twr_session_set_service_type(session(reporterID), serviceType, reply, context);
  });
  ValuePayload payload;
  if (const twr_status status = payload.set(configuration); status != TWR_OK)
    return reportUnsendable("setConfiguration", status);
  request("setConfiguration", [&](twr_reply reply, void* context) {
    return twr_session_set_configuration(session(reporterID), payload.get(), reply, context);
  });
}

void DaemonLink::start(std::int64_t reporterID) {
  // The daemon answers a start when the session stops, so a reply would stay pending for the session's whole
  // life. A start that the library does not take has no consequence here: SessionSink reports no failures.
  twr_session_start(session(reporterID), nullptr, nullptr);
}

void DaemonLink::message(std::int64_t reporterID, std::uint32_t category, std::uint16_t type,
                         ValueMap message) {
  if (console_.isVerbose()) {
    console_.detail("session " + std::to_string(reporterID) + ": " + message.text());
  }
  ValuePayload payload;
  if (const twr_status status = payload.set(message); status != TWR_OK)
    return reportUnsendable("sendMessage", status);
  request("sendMessage", [&](twr_reply reply, void* context) {
    return twr_session_send(session(reporterID), category, type, payload.get(), reply, context);
  });
}

void DaemonLink::stop(std::int64_t reporterID) {
  request("stopReportingSessionForID", [&](twr_reply reply, void* context) {
    return twr_session_stop(session(reporterID), reply, context);
  });
}

void DaemonLink::destroy(std::int64_t reporterID) {
  request("destroyReportingSession", [&](twr_reply reply, void* context) {
    return twr_session_destroy(session(reporterID), reply, context);
  });
  sessions_.erase(reporterID);
}

twr_client_info DaemonLink::info() const {
  twr_client_info info{};
  info.size = sizeof(info);
  twr_client_get_info(client_, &info);
  return info;
}

twr_session* DaemonLink::session(std::int64_t reporterID) const {
  const auto found = sessions_.find(reporterID);
  return found == sessions_.end() ? nullptr : found->second;
}

void DaemonLink::reportUnsendable(const char* method, twr_status status) const {
  console_.say(std::string(method) + " was not sent: " + twr_status_text(status));
}

template <class Call>
void DaemonLink::request(const char* method, Call call) {
  auto pending = std::make_unique<PendingRequest>(PendingRequest{*this, method});
  // The library now owns it, and gives it to answered(). A request that the library does not take has no
  // answer.
  if (call(&DaemonLink::answered, pending.get()) == TWR_OK) static_cast<void>(pending.release());
}

// Runs on the library's thread.
void DaemonLink::answered(void* context, const twr_answer* answer) {
  const std::unique_ptr<PendingRequest> pending(static_cast<PendingRequest*>(context));
  if (answer->status != TWR_REFUSED) return;
  const std::string message = answer->error_message;
  std::string refusal = std::string(pending->method) + " refused: " + answer->error_domain + " " +
                        std::to_string(answer->error_code);
  if (!message.empty()) refusal += " (" + message + ")";
  DaemonLink& link = pending->link;
  link.inbox_.post([&link, refusal] { link.reportRefusal(refusal); });
}

// Runs on the library's thread.
void DaemonLink::stateChanged(void* context, twr_state state) {
  auto& link = *static_cast<DaemonLink*>(context);
  link.inbox_.post([&link, state] { link.changed(state, link.info().last_error); });
}

void DaemonLink::changed(twr_state state, int error) {
  if (state == TWR_STATE_CONNECTED) return connected();
  if (state != TWR_STATE_WAITING && state != TWR_STATE_ENDED) return;
  if (std::exchange(isConnected_, false)) {
    console_.say("lost the reporting daemon (" + textOf(error) + ")");
  } else if (!std::exchange(hasReportedAbsence_, true)) {
    console_.say("no reporting daemon (" + textOf(error) + "), trying on");
  }
}

void DaemonLink::connected() {
  isConnected_ = true;
  hasReportedAbsence_ = false;
  lastRefusal_.clear();
  console_.say("connected to the reporting daemon");
  onConnected_(std::exchange(wasConnected_, true) ? Connection::kAgain : Connection::kFirst);
}

void DaemonLink::reportRefusal(const std::string& refusal) {
  if (refusal == lastRefusal_) return;
  console_.say(refusal);
  lastRefusal_ = refusal;
}

}  // namespace tonewerk
