// SPDX-License-Identifier: Apache-2.0
// Implements the C interface to clients, sessions and senders. It checks the arguments and lets no exception
// through.
#include "tonewerk/reporting.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <ctime>
#include <memory>
#include <new>
#include <span>
#include <string>
#include <string_view>
#include <sys/random.h>
#include <utility>

#include "client/ClientRegistry.h"
#include "client/MessageFrame.h"
#include "client/Payload.h"
#include "client/SessionActivity.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/Requests.h"
#include "values/Utf8.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using Kind = SessionChange::Kind;

// Runs `function`; returns `otherwise` when it throws, as without memory.
template <class Result, class Function>
Result guarded(Result otherwise, Function function) noexcept {
  try {
    return function();
  } catch (...) {
    return otherwise;
  }
}

template <class Function>
twr_status guarded(Function function) noexcept {
  return guarded(TWR_NO_MEMORY, function);
}

ClientSettings settingsOf(const twr_client_options* given) {
  twr_client_options options{};
  // A caller that was built with an older version knows fewer members.
  if (given != nullptr) std::memcpy(&options, given, std::min(given->size, sizeof(options)));
  ClientSettings settings;
  const bool isChosen = options.socket_path != nullptr && *options.socket_path != '\0';
  settings.socketPaths = isChosen ? std::vector<std::string>{options.socket_path} : defaultSocketPaths();
  if (options.queue_bytes != 0) settings.queueBytes = options.queue_bytes;
  settings.isOnce = (options.flags & TWR_CLIENT_ONCE) != 0;
  settings.stateChanged = options.state_changed;
  settings.context = options.context;
  return settings;
}

double secondsNow() {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

RingMessage messageOf(std::uint32_t category, std::uint16_t type, const twr_payload& payload) {
  RingMessage message{};
  message.category = category;
  message.type = type;
  message.time = secondsNow();
  message.entries = payload.entries;
  message.bytes = {payload.bytes, payload.size};
  return message;
}

twr_status problemOfMessage(const twr_payload* payload, std::size_t reporterIDs) {
  if (payload == nullptr) return TWR_INVALID;
  const twr_status problem = problemOfMap(*payload);
  if (problem != TWR_OK) return problem;
  return fitsMessageFrame(payload->size, reporterIDs) ? TWR_OK : TWR_TOO_LARGE;
}

// Returns a positive number that is larger than numbers that people choose.
std::int64_t randomIdentifier() {
  std::uint64_t bits = 0;
  if (::getrandom(&bits, sizeof(bits), GRND_NONBLOCK) != sizeof(bits)) {
    bits = static_cast<std::uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count()) *
           0x9E3779B97F4A7C15U;
  }
  constexpr std::uint64_t kLarge = std::uint64_t{1} << 62U;
  return static_cast<std::int64_t>((bits & (kLarge - 1)) | kLarge);
}

twr_status ask(twr_client* client, std::string_view method, const Arguments& arguments, PendingReply reply) {
  if (client == nullptr) return TWR_INVALID;
  return guarded([&] {
    return client->engine.request([&](ClientOutbox& outbox) {
      std::string body;
      RpcWriter(body).body(method, arguments);
      return outbox.request(std::move(body), reply);
    });
  });
}

twr_status change(twr_session* session, SessionChange change, PendingReply reply) {
  if (session == nullptr) return TWR_INVALID;
  return guarded([&] {
    return session->engine.request(
        [&](ClientOutbox& outbox) { return outbox.change(*session, std::move(change), reply); });
  });
}

}  // namespace

}  // namespace tonewerk

using namespace tonewerk;

const char* twr_status_text(twr_status status) {
  switch (status) {
    case TWR_OK:
      return "done";
    case TWR_INVALID:
      return "an argument is not valid";
    case TWR_TOO_LARGE:
      return "too large";
    case TWR_FULL:
      return "no room left";
    case TWR_NO_MEMORY:
      return "out of memory";
    case TWR_NOT_CONNECTED:
      return "not connected to the daemon";
    case TWR_REFUSED:
      return "the daemon refused the request";
    case TWR_TIMED_OUT:
      return "timed out";
    case TWR_FORKED:
      return "the object belongs to the parent process";
    case TWR_WOULD_WAIT:
      return "cannot wait inside a callback";
    case TWR_DESTROYED:
      return "the client was destroyed before the answer came";
  }
  return "unknown status";
}

const char* twr_version(void) { return TONEWERK_VERSION; }

// ---- the client ----

twr_client* twr_client_create(const twr_client_options* options) {
  return guarded<twr_client*>(nullptr, [&] { return makeClient(settingsOf(options)); });
}

void twr_client_destroy(twr_client* client, int timeoutMs) {
  if (client == nullptr) return;
  ClientEngine& engine = client->engine;
  if (!engine.hasForked()) {
    if (engine.endByItself(milliseconds(timeoutMs))) return;
    engine.end(milliseconds(timeoutMs));
  }
  clientRegistry::remove(engine).reset();
  if (!ClientThread::isCurrent()) clientRegistry::reapDetached();
}

twr_status twr_client_connect(twr_client* client, int timeoutMs) {
  if (client == nullptr) return TWR_INVALID;
  return guarded([&] { return client->engine.connect(milliseconds(timeoutMs)); });
}

twr_status twr_client_flush(twr_client* client, int timeoutMs) {
  if (client == nullptr) return TWR_INVALID;
  return guarded([&] { return client->engine.flush(milliseconds(timeoutMs)); });
}

twr_status twr_client_get_info(const twr_client* client, twr_client_info* info) {
  if (client == nullptr || info == nullptr) return TWR_INVALID;
  const std::size_t size = std::min(info->size, sizeof(twr_client_info));
  twr_client_info known = client->engine.info();
  known.size = info->size;
  std::memcpy(info, &known, size);
  return client->engine.hasForked() ? TWR_FORKED : TWR_OK;
}

twr_status twr_client_send(twr_client* client, uint32_t category, uint16_t type, const twr_payload* payload,
                           const int64_t* reporterIDs, size_t count, twr_reply reply, void* context) {
  if (client == nullptr || (reporterIDs == nullptr && count > 0)) return TWR_INVALID;
  if (const twr_status problem = problemOfMessage(payload, count); problem != TWR_OK) return problem;
  return guarded([&] {
    return client->engine.request([&](ClientOutbox& outbox) {
      return outbox.send(nullptr, messageOf(category, type, *payload), {reporterIDs, count},
                         {reply, context});
    });
  });
}

twr_status twr_client_get_service_type(twr_client* client, int64_t reporterID, twr_reply reply,
                                       void* context) {
  return ask(client, requests::kGetServiceNameForReporterID.name, {Value(reporterID)},
             {reply, context, AnswerKind::kServiceType});
}

twr_status twr_client_validate(twr_client* client, int64_t reporterID, twr_reply reply, void* context) {
  return ask(client, requests::kReporterIDValid.name, {Value(reporterID)},
             {reply, context, AnswerKind::kValidity});
}

twr_status twr_client_get_all_reporters(twr_client* client, twr_reply reply, void* context) {
  return ask(client, requests::kGetAllReporters.name, {}, {reply, context, AnswerKind::kReporters});
}

twr_status twr_client_kill_service(twr_client* client, twr_reply reply, void* context) {
  return ask(client, requests::kKillService.name, {}, {reply, context});
}

twr_status twr_client_request(twr_client* client, const char* method, const twr_payload* parameters,
                              twr_reply reply, void* context) {
  if (client == nullptr || method == nullptr || !isText(method)) return TWR_INVALID;
  if (parameters != nullptr) {
    const twr_status problem = twr_payload_problem(parameters);
    if (problem != TWR_OK) return problem;
    if ((parameters->flags & kPayloadIsList) == 0) return TWR_INVALID;
  }
  return guarded([&] {
    std::string body;
    appendRequestBody(body, method, parameters);
    if (body.size() + RpcWriter::kMaxHeadBytes > kMaxFrameBytes) return TWR_TOO_LARGE;
    return client->engine.request([&](ClientOutbox& outbox) {
      PendingReply pending{reply, context};
      pending.mayBeHeld = true;  // the method is not known here
      return outbox.request(std::move(body), pending);
    });
  });
}

// ---- sessions ----

twr_session* twr_session_create(twr_client* client, int64_t reporterID) {
  if (client == nullptr || client->engine.hasForked()) return nullptr;
  const std::int64_t identifier = reporterID == TWR_NEW_ID ? randomIdentifier() : reporterID;
  return guarded<twr_session*>(nullptr, [&] {
    return client->engine.withOutbox(
        [&](ClientOutbox& outbox) { return outbox.addSession(client->engine, identifier).get(); });
  });
}

int64_t twr_session_id(const twr_session* session) { return session == nullptr ? 0 : session->identifier; }

twr_status twr_session_set_service_type(twr_session* session, uint16_t serviceType, twr_reply reply,
                                        void* context) {
  return change(session, {Kind::kServiceType, serviceType, {}}, {reply, context});
}

twr_status twr_session_set_configuration(twr_session* session, const twr_payload* configuration,
                                         twr_reply reply, void* context) {
  if (session == nullptr || configuration == nullptr) return TWR_INVALID;
  if (const twr_status problem = problemOfMap(*configuration); problem != TWR_OK) return problem;
  if (!fitsMessageFrame(configuration->size, 1)) return TWR_TOO_LARGE;
  return guarded([&] {
    std::optional<ValueMap> map = mapOf(*configuration);
    if (!map) return TWR_INVALID;
    return change(session, {Kind::kConfiguration, TWR_SERVICE_UNKNOWN, std::move(*map)}, {reply, context});
  });
}

twr_status twr_session_start(twr_session* session, twr_reply stopped, void* context) {
  return change(session, {Kind::kStart, TWR_SERVICE_UNKNOWN, {}}, {stopped, context});
}

twr_status twr_session_send(twr_session* session, uint32_t category, uint16_t type,
                            const twr_payload* payload, twr_reply reply, void* context) {
  if (session == nullptr) return TWR_INVALID;
  if (const twr_status problem = problemOfMessage(payload, 1); problem != TWR_OK) return problem;
  return guarded([&] {
    return session->engine.request([&](ClientOutbox& outbox) {
      return outbox.send(session, messageOf(category, type, *payload), {&session->identifier, 1},
                         {reply, context});
    });
  });
}

twr_status twr_session_stop(twr_session* session, twr_reply reply, void* context) {
  if (session != nullptr) endActivity(*session);
  return change(session, {Kind::kStop, TWR_SERVICE_UNKNOWN, {}}, {reply, context});
}

twr_status twr_session_destroy(twr_session* session, twr_reply reply, void* context) {
  if (session == nullptr) return TWR_INVALID;
  // In a forked child the copy is kept until the copy of its client is destroyed.
  if (session->engine.hasForked()) return TWR_FORKED;
  endActivity(*session);
  return guarded([&] {
    return session->engine.withOutbox([&](ClientOutbox& outbox) {
      return outbox.destroy(*session, {reply, context});
    });
  });
}

// ---- senders ----

twr_sender* twr_sender_open(twr_session* session, size_t ringBytes) {
  if (session == nullptr || session->engine.hasForked()) return nullptr;
  const std::size_t bytes = ringBytes == 0 ? std::size_t{TWR_DEFAULT_RING_BYTES} : ringBytes;
  if (bytes > TWR_MOST_RING_BYTES) return nullptr;
  return guarded<twr_sender*>(nullptr, [&] {
    return session->engine.withOutbox([&](ClientOutbox& outbox) {
      return outbox.openSender(*session, session->engine.hasForked(), bytes).get();
    });
  });
}

// Hot functions lie next to each other in the program.
[[gnu::hot]] twr_status twr_sender_send(twr_sender* sender, uint32_t category, uint16_t type,
                                        const twr_payload* payload) {
  if (sender == nullptr || payload == nullptr) return TWR_INVALID;
  if (sender->hasForked.load(std::memory_order_relaxed)) return TWR_FORKED;
  return sender->ring.push(category, type, *payload);
}

uint64_t twr_sender_dropped(const twr_sender* sender) {
  return sender == nullptr ? 0 : sender->ring.dropped();
}

void twr_sender_close(twr_sender* sender) {
  if (sender == nullptr || sender->hasForked.load()) return;
  const std::shared_ptr<twr_session> session = sender->session.lock();
  guarded(TWR_NO_MEMORY, [&] {
    return session->engine.withOutbox([&](ClientOutbox& outbox) {
      outbox.closeSender(*sender);
      return TWR_OK;
    });
  });
}
