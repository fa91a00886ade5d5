// SPDX-License-Identifier: Apache-2.0
#ifndef TONEWERK_REPORTING_HPP
#define TONEWERK_REPORTING_HPP

// Wraps the C interface of tonewerk/reporting.h for C++17 and later. See there for what is not described
// here.
//
//   namespace tr = tonewerk::reporting;
//   tr::Client client;
//   tr::Session session(client);
//   session.setServiceType(tr::Service::kLongFormAudio);
//   session.start();
//   tr::Sender sender(session);  // for the audio callback
//
//   tr::Payload<128> payload;
//   payload.put("session_output_running", true).put("QMSessionVolume", 0.5);
//   sender.send(tr::Category::kPlayback, tr::Type::kStart, payload);
//
// Objects can be moved but not copied. An object is empty when it could not be made or was moved from: it
// converts to false, and its calls do nothing and return Status::kInvalid. A session keeps its client alive,
// and a sender keeps its session alive, so they may be destroyed in any order.
//
// Nothing here throws. The program ends when there is no memory for an object of this header. A reply runs on
// the client's background thread. The rules of twr_reply apply to it. It may destroy the last object that
// keeps the client alive. An exception that leaves it ends the program.

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <new>
#include <string>
#include <string_view>
#include <tonewerk/reporting.h>
#include <type_traits>
#include <utility>
#include <vector>

namespace tonewerk {
namespace reporting {

class AudioUse;  // of tonewerk/reporting_audio.hpp

enum class Status {
  kOk = TWR_OK,
  kInvalid = TWR_INVALID,
  kTooLarge = TWR_TOO_LARGE,
  kFull = TWR_FULL,
  kNoMemory = TWR_NO_MEMORY,
  kNotConnected = TWR_NOT_CONNECTED,
  kRefused = TWR_REFUSED,
  kTimedOut = TWR_TIMED_OUT,
  kForked = TWR_FORKED,
  kWouldWait = TWR_WOULD_WAIT,
  kDestroyed = TWR_DESTROYED
};

enum class State {
  kIdle = TWR_STATE_IDLE,
  kConnecting = TWR_STATE_CONNECTING,
  kConnected = TWR_STATE_CONNECTED,
  kWaiting = TWR_STATE_WAITING,
  kEnded = TWR_STATE_ENDED
};

enum class Category : std::uint32_t {
  kGeneric = TWR_CATEGORY_GENERIC,
  kRecord = TWR_CATEGORY_RECORD,
  kInput = TWR_CATEGORY_INPUT,
  kPlayback = TWR_CATEGORY_PLAYBACK,
  kOutput = TWR_CATEGORY_OUTPUT,
  kPlaybackAndRecord = TWR_CATEGORY_PLAYBACK_AND_RECORD,
  kIO = TWR_CATEGORY_IO,
  kSetup = TWR_CATEGORY_SETUP,
  kClientRequest = TWR_CATEGORY_CLIENT_REQUEST,
  kRouteChange = TWR_CATEGORY_ROUTE_CHANGE,
  kError = TWR_CATEGORY_ERROR,
  kChanmetering = TWR_CATEGORY_CHANMETERING,
  kPerformance = TWR_CATEGORY_PERFORMANCE,
  kVolume = TWR_CATEGORY_VOLUME,
  kGather = TWR_CATEGORY_GATHER,
  kHearingHealth = TWR_CATEGORY_HEARING_HEALTH,
  kUnknown = TWR_CATEGORY_UNKNOWN
};

// The part of the audio stack that reports a message, as in Category::kIO | Domain::kHAL.
enum class Domain : std::uint32_t {
  kMIDI = TWR_DOMAIN_MIDI,
  kSession = TWR_DOMAIN_SESSION,
  kDSP = TWR_DOMAIN_DSP,
  kHAL = TWR_DOMAIN_HAL,
  kRouting = TWR_DOMAIN_ROUTING,
  kToolbox = TWR_DOMAIN_TOOLBOX
};

constexpr Category operator|(Category category, Domain domain) noexcept {
  return static_cast<Category>(static_cast<std::uint32_t>(category) | static_cast<std::uint32_t>(domain));
}

enum class Type : std::uint16_t {
  kGeneric = TWR_TYPE_GENERIC,
  kStart = TWR_TYPE_START,
  kStop = TWR_TYPE_STOP,
  kActivate = TWR_TYPE_ACTIVATE,
  kDeactivate = TWR_TYPE_DEACTIVATE,
  kSetup = TWR_TYPE_SETUP,
  kError = TWR_TYPE_ERROR,
  kIssueDetector = TWR_TYPE_ISSUE_DETECTOR,
  kEnergybook = TWR_TYPE_ENERGYBOOK,
  kModulonUsage = TWR_TYPE_MODULON_USAGE,
  kMIDIDriver = TWR_TYPE_MIDI_DRIVER,
  kSummary = TWR_TYPE_SUMMARY,
  kHeadphoneAudioExposure = TWR_TYPE_HEADPHONE_AUDIO_EXPOSURE,
  kAudioExposure = TWR_TYPE_AUDIO_EXPOSURE,
  kListeningEnhancement = TWR_TYPE_LISTENING_ENHANCEMENT,
  kPellix = TWR_TYPE_PELLIX,
  kSimple = TWR_TYPE_SIMPLE,
  kHistogram = TWR_TYPE_HISTOGRAM,
  kState = TWR_TYPE_STATE,
  kMemoryLog = TWR_TYPE_MEMORY_LOG,
  kUnknown = TWR_TYPE_UNKNOWN
};

enum class Service : std::uint16_t {
  kGeneric = TWR_SERVICE_GENERIC,
  kVocia = TWR_SERVICE_VOCIA,
  kTelephony = TWR_SERVICE_TELEPHONY,
  kHaptics = TWR_SERVICE_HAPTICS,
  kAlarms = TWR_SERVICE_ALARMS,
  kStandalone = TWR_SERVICE_STANDALONE,
  kSoundAutoConfig = TWR_SERVICE_SOUND_AUTO_CONFIG,
  kLongFormAudio = TWR_SERVICE_LONG_FORM_AUDIO,
  kNonLongFormAudio = TWR_SERVICE_NON_LONG_FORM_AUDIO,
  kAudioDeviceUsage = TWR_SERVICE_AUDIO_DEVICE_USAGE,
  kAlerts = TWR_SERVICE_ALERTS,
  kTest = TWR_SERVICE_TEST,
  kAPIUsage = TWR_SERVICE_API_USAGE,
  kSystemSounds = TWR_SERVICE_SYSTEM_SOUNDS,
  kUnknown = TWR_SERVICE_UNKNOWN
};

// Describes the status in English, for logs.
inline const char* text(Status status) noexcept { return ::twr_status_text(static_cast<twr_status>(status)); }

inline const char* version() noexcept { return ::twr_version(); }

// A point in time in seconds since 1970 UTC. A type of its own, so that it differs from a number.
struct Date {
  double seconds;
};

// ---- payloads ----

// Has the functions of a payload of any size. Every call puts one entry and returns the payload for the next
// call. An entry that does not fit, or is not valid text, marks the payload, which is then refused as a
// whole. Any thread may use it, also a real-time one, but only one at a time.
class AnyPayload {
 public:
  AnyPayload(const AnyPayload&) = delete;
  AnyPayload& operator=(const AnyPayload&) = delete;

  // Puts a boolean, an integer, a floating-point number, a text that converts to a std::string_view, a Date,
  // or a time of the system's clock.
  template <class T>
  AnyPayload& put(const char* name, const T& value) noexcept {
    using Held = std::decay_t<T>;
    if constexpr (std::is_same_v<Held, bool>) {
      ::twr_put_bool(&payload_, name, value ? 1 : 0);
    } else if constexpr (std::is_integral_v<Held> && std::is_signed_v<Held>) {
      ::twr_put_int(&payload_, name, static_cast<std::int64_t>(value));
    } else if constexpr (std::is_integral_v<Held>) {
      ::twr_put_uint(&payload_, name, static_cast<std::uint64_t>(value));
    } else if constexpr (std::is_floating_point_v<Held>) {
      ::twr_put_double(&payload_, name, static_cast<double>(value));
    } else if constexpr (std::is_same_v<Held, Date>) {
      ::twr_put_date(&payload_, name, value.seconds);
    } else if constexpr (std::is_same_v<Held, std::chrono::system_clock::time_point>) {
      ::twr_put_date(&payload_, name, std::chrono::duration<double>(value.time_since_epoch()).count());
    } else if constexpr (std::is_same_v<Held, const char*> || std::is_same_v<Held, char*>) {
      ::twr_put_text(&payload_, name, value);
    } else {
      static_assert(std::is_convertible_v<const T&, std::string_view>, "a payload cannot hold this type");
      const std::string_view text = value;
      ::twr_put_text_n(&payload_, name, text.data(), text.size());
    }
    return *this;
  }

  // Puts a value into a list, where values have no names.
  template <class T>
  AnyPayload& put(const T& value) noexcept {
    return put(nullptr, value);
  }

  // Put a map or a list. `fill` gets the payload and puts the entries. Without a name: into a list.
  template <class Fill>
  AnyPayload& map(const char* name, Fill&& fill) {
    return nested(::twr_open_map(&payload_, name), std::forward<Fill>(fill));
  }
  template <class Fill>
  AnyPayload& map(Fill&& fill) {
    return map(nullptr, std::forward<Fill>(fill));
  }
  template <class Fill>
  AnyPayload& list(const char* name, Fill&& fill) {
    return nested(::twr_open_list(&payload_, name), std::forward<Fill>(fill));
  }
  template <class Fill>
  AnyPayload& list(Fill&& fill) {
    return list(nullptr, std::forward<Fill>(fill));
  }

  // Why the payload would be refused; kOk when it would not.
  Status problem() const noexcept { return static_cast<Status>(::twr_payload_problem(&payload_)); }

  const twr_payload* get() const noexcept { return &payload_; }

 protected:
  AnyPayload() noexcept = default;
  ~AnyPayload() = default;

  twr_payload payload_{};

 private:
  template <class Fill>
  AnyPayload& nested(twr_status opened, Fill&& fill) {
    if (opened != TWR_OK) return *this;
    std::forward<Fill>(fill)(*this);
    ::twr_close(&payload_);
    return *this;
  }
};

// A map of named values, with room for `Bytes` bytes. An entry takes the bytes of its name and text and at
// most 20 more.
template <std::size_t Bytes = 256>
class Payload final : public AnyPayload {
 public:
  Payload() noexcept { clear(); }

  void clear() noexcept { ::twr_payload_init(&payload_, memory_, Bytes); }

 private:
  unsigned char memory_[Bytes];
};

// A list, for Client::request(). Its values have no names.
template <std::size_t Bytes = 256>
class Parameters final : public AnyPayload {
 public:
  Parameters() noexcept { ::twr_payload_init_list(&payload_, memory_, Bytes); }

  // A parameter that is left out.
  Parameters& putNil() noexcept {
    ::twr_put_nil(&payload_);
    return *this;
  }

 private:
  unsigned char memory_[Bytes];
};

// ---- answers ----

// Holds a copy of the answer to a request. It may be kept.
struct Answer {
  Status status = Status::kNotConnected;
  std::string errorDomain;  // these three: the daemon's error for Status::kRefused
  std::int64_t errorCode = 0;
  std::string errorMessage;
  std::int64_t reporterID = 0;              // for validate(); 0 when no session has it
  Service serviceType = Service::kGeneric;  // for validate() and getServiceType()
  std::vector<std::int64_t> reporterIDs;    // for getAllReporters()
  std::vector<unsigned char> result;        // as MessagePack

  explicit operator bool() const noexcept { return status == Status::kOk; }
};

// Called once for each request that was queued (Status::kOk). Pass an empty one when no answer is wanted.
using Reply = std::function<void(Answer answer)>;

// ---- inside ----

namespace detail {

inline std::string textOf(const char* text) { return text == nullptr ? std::string() : std::string(text); }

inline Answer answerOf(const twr_answer& given) {
  Answer answer;
  answer.status = static_cast<Status>(given.status);
  answer.errorDomain = textOf(given.error_domain);
  answer.errorCode = given.error_code;
  answer.errorMessage = textOf(given.error_message);
  answer.reporterID = given.reporter_id;
  answer.serviceType = static_cast<Service>(given.service_type);
  if (given.reporter_ids != nullptr)
    answer.reporterIDs.assign(given.reporter_ids, given.reporter_ids + given.reporter_id_count);
  if (const auto* bytes = static_cast<const unsigned char*>(given.result); bytes != nullptr)
    answer.result.assign(bytes, bytes + given.result_size);
  return answer;
}

inline void runReply(void* context, const twr_answer* answer) noexcept {
  const std::unique_ptr<Reply> reply(static_cast<Reply*>(context));
  (*reply)(answerOf(*answer));
}

inline void runStateChanged(void* context, twr_state state) noexcept {
  (*static_cast<std::function<void(State)>*>(context))(static_cast<State>(state));
}

// Makes a call of the C interface with a function and a context that run `reply`. The library owns the copy
// of `reply` once the call has succeeded, and this function deletes it otherwise.
template <class Call>
Status withReply(Reply&& reply, Call call) noexcept {
  if (!reply) return static_cast<Status>(call(nullptr, nullptr));
  std::unique_ptr<Reply> kept(new (std::nothrow) Reply(std::move(reply)));
  if (!kept) return Status::kNoMemory;
  const twr_status status = call(&runReply, static_cast<void*>(kept.get()));
  if (status == TWR_OK) static_cast<void>(kept.release());
  return static_cast<Status>(status);
}

inline int millisecondsOf(std::chrono::milliseconds time) noexcept {
  constexpr std::chrono::milliseconds::rep kMost = std::numeric_limits<int>::max();
  if (time.count() < 0) return 0;
  return static_cast<int>(time.count() < kMost ? time.count() : kMost);
}

// The state that a Client and its sessions share.
struct ClientHandle {
  ClientHandle() = default;
  ClientHandle(const ClientHandle&) = delete;
  ClientHandle& operator=(const ClientHandle&) = delete;
  ~ClientHandle() { ::twr_client_destroy(client, closeTimeoutMs); }

  std::function<void(State)> stateChanged;  // the client calls it, so it outlives the client
  int closeTimeoutMs = 1000;
  twr_client* client = nullptr;
};

// The state that a Session and its senders share.
struct SessionHandle {
  SessionHandle() = default;
  SessionHandle(const SessionHandle&) = delete;
  SessionHandle& operator=(const SessionHandle&) = delete;
  ~SessionHandle() {
    withReply(std::move(destroyed), [this](twr_reply reply, void* context) {
      return ::twr_session_destroy(session, reply, context);
    });
  }

  std::shared_ptr<ClientHandle> client;
  Reply destroyed;
  twr_session* session = nullptr;
};

}  // namespace detail

// ---- the client ----

struct ClientOptions {
  std::string socketPath;                   // empty: the usual sockets
  std::size_t queueBytes = 0;               // the most bytes that wait for the daemon; 0: the default
  bool once = false;                        // tries to connect only once and never again
  std::function<void(State)> stateChanged;  // runs on the background thread, as a reply does
};

struct ClientInfo {
  State state = State::kEnded;
  int lastError = 0;  // errno
  std::string socketPath;
  std::uint64_t connections = 0;
  std::uint64_t messagesSent = 0;
  std::uint64_t messagesDropped = 0;
  std::uint64_t queuedBytes = 0;
};

// Is one connection to the daemon, opened when it is first needed. Any thread.
class Client {
 public:
  using Milliseconds = std::chrono::milliseconds;

  Client() noexcept : Client(ClientOptions()) {}
  explicit Client(ClientOptions options) noexcept { open(std::move(options)); }
  Client(Client&&) noexcept = default;
  Client& operator=(Client&&) noexcept = default;
  // If no session is left, waits up to the close time-out until all requests are sent and answered. Otherwise
  // the last session's destructor does.
  ~Client() = default;

  explicit operator bool() const noexcept { return get() != nullptr; }
  twr_client* get() const noexcept { return handle_ ? handle_->client : nullptr; }

  // How long the destructor may wait. 1 s by default.
  void setCloseTimeout(Milliseconds timeout) noexcept {
    if (handle_) handle_->closeTimeoutMs = detail::millisecondsOf(timeout);
  }

  Status connect(Milliseconds timeout) noexcept {
    return static_cast<Status>(::twr_client_connect(get(), detail::millisecondsOf(timeout)));
  }
  Status flush(Milliseconds timeout) noexcept {
    return static_cast<Status>(::twr_client_flush(get(), detail::millisecondsOf(timeout)));
  }

  ClientInfo info() const {
    twr_client_info given{};
    given.size = sizeof(given);
    ClientInfo info;
    if (::twr_client_get_info(get(), &given) != TWR_OK) return info;
    info.state = static_cast<State>(given.state);
    info.lastError = given.last_error;
    info.socketPath = given.socket_path;
    info.connections = given.connections;
    info.messagesSent = given.messages_sent;
    info.messagesDropped = given.messages_dropped;
    info.queuedBytes = given.queued_bytes;
    return info;
  }

  // Sends a message to these sessions. Without identifiers it goes to every started session, or, if there is
  // none, to the daemon's own single-message session.
  Status send(Category category, Type type, const AnyPayload& payload,
              const std::vector<std::int64_t>& reporterIDs = {}, Reply reply = {}) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_client_send(get(), static_cast<std::uint32_t>(category), static_cast<std::uint16_t>(type),
                               payload.get(), reporterIDs.data(), reporterIDs.size(), run, context);
    });
  }
  Status getServiceType(std::int64_t reporterID, Reply reply) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_client_get_service_type(get(), reporterID, run, context);
    });
  }
  Status validate(std::int64_t reporterID, Reply reply) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_client_validate(get(), reporterID, run, context);
    });
  }
  Status getAllReporters(Reply reply) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_client_get_all_reporters(get(), run, context);
    });
  }
  // Ends the daemon. The only answer is the end of the connection: Status::kNotConnected.
  Status killService(Reply reply = {}) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_client_kill_service(get(), run, context);
    });
  }
  // Calls any method of the protocol by its name.
  template <std::size_t Bytes>
  Status request(const char* method, const Parameters<Bytes>& parameters, Reply reply = {}) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_client_request(get(), method, parameters.get(), run, context);
    });
  }

 private:
  friend class Session;

  void open(ClientOptions options) noexcept {
    const auto handle = std::make_shared<detail::ClientHandle>();
    handle->stateChanged = std::move(options.stateChanged);
    twr_client_options given{};
    given.size = sizeof(given);
    given.socket_path = options.socketPath.empty() ? nullptr : options.socketPath.c_str();
    given.queue_bytes = options.queueBytes;
    given.flags = options.once ? static_cast<unsigned>(TWR_CLIENT_ONCE) : 0U;
    if (handle->stateChanged) given.state_changed = &detail::runStateChanged;
    given.context = &handle->stateChanged;
    handle->client = ::twr_client_create(&given);
    if (handle->client != nullptr) handle_ = handle;
  }

  std::shared_ptr<detail::ClientHandle> handle_;
};

// ---- sessions ----

// Reports one use of audio. Any thread. The session is destroyed with this object and the last of its
// senders; a started session is stopped then.
class Session {
 public:
  explicit Session(Client& client, std::int64_t reporterID = TWR_NEW_ID) noexcept {
    const auto handle = std::make_shared<detail::SessionHandle>();
    handle->session = ::twr_session_create(client.get(), reporterID);
    if (handle->session == nullptr) return;
    handle->client = client.handle_;
    handle_ = handle;
  }
  Session(Session&&) noexcept = default;
  Session& operator=(Session&&) noexcept = default;
  ~Session() = default;

  explicit operator bool() const noexcept { return get() != nullptr; }
  twr_session* get() const noexcept { return handle_ ? handle_->session : nullptr; }
  std::int64_t id() const noexcept { return ::twr_session_id(get()); }

  Status setServiceType(Service service, Reply reply = {}) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_session_set_service_type(get(), static_cast<std::uint16_t>(service), run, context);
    });
  }
  Status setConfiguration(const AnyPayload& configuration, Reply reply = {}) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_session_set_configuration(get(), configuration.get(), run, context);
    });
  }
  Status start(Reply stopped = {}) noexcept {
    return detail::withReply(std::move(stopped), [&](twr_reply run, void* context) {
      return ::twr_session_start(get(), run, context);
    });
  }
  Status send(Category category, Type type, const AnyPayload& payload, Reply reply = {}) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_session_send(get(), static_cast<std::uint32_t>(category), static_cast<std::uint16_t>(type),
                                payload.get(), run, context);
    });
  }
  Status stop(Reply reply = {}) noexcept {
    return detail::withReply(std::move(reply), [&](twr_reply run, void* context) {
      return ::twr_session_stop(get(), run, context);
    });
  }
  // Leaves this object empty. The session is destroyed with its last sender; `reply` is the reply to that.
  void destroy(Reply reply = {}) noexcept {
    if (handle_) handle_->destroyed = std::move(reply);
    handle_.reset();
  }

 private:
  friend class AudioUse;
  friend class Sender;

  std::shared_ptr<detail::SessionHandle> handle_;
};

// ---- senders ----

// Lets a real-time thread send to a session. Only send() is for such a thread; making and destroying a sender
// is not.
class Sender {
 public:
  // `ringBytes` is rounded up to a power of two; 0 for the default.
  explicit Sender(Session& session, std::size_t ringBytes = 0) noexcept
      : session_(session.handle_), sender_(::twr_sender_open(session.get(), ringBytes)) {}
  Sender(Sender&& other) noexcept
      : session_(std::move(other.session_)), sender_(std::exchange(other.sender_, nullptr)) {}
  Sender& operator=(Sender&& other) noexcept {
    Sender(std::move(other)).swap(*this);
    return *this;
  }
  ~Sender() { ::twr_sender_close(sender_); }

  void swap(Sender& other) noexcept {
    session_.swap(other.session_);
    std::swap(sender_, other.sender_);
  }

  explicit operator bool() const noexcept { return sender_ != nullptr; }
  twr_sender* get() const noexcept { return sender_; }

  // Wait-free: no lock, no allocation, no system call.
  Status send(Category category, Type type, const AnyPayload& payload) noexcept {
    return static_cast<Status>(::twr_sender_send(sender_, static_cast<std::uint32_t>(category),
                                                 static_cast<std::uint16_t>(type), payload.get()));
  }

  std::uint64_t dropped() const noexcept { return ::twr_sender_dropped(sender_); }

 private:
  std::shared_ptr<detail::SessionHandle> session_;
  twr_sender* sender_;
};

}  // namespace reporting
}  // namespace tonewerk

#endif  // TONEWERK_REPORTING_HPP
