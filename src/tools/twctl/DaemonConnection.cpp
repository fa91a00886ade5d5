// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/DaemonConnection.h"

#include <algorithm>
#include <cstdint>
#include <deque>
#include <poll.h>
#include <utility>

#include "client/ValuePayload.h"
#include "platform/linux/descriptors/WakeEvent.h"
#include "platform/linux/messagepack/RpcValueReader.h"
#include "tonewerk/reporting.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

constexpr milliseconds kConnectTimeout{10'000};
constexpr milliseconds kSendTimeout{10'000};
constexpr milliseconds kCloseTimeout{1'000};
// Large, because a recording without pauses is sent much faster than the daemon processes it.
constexpr std::size_t kQueueBytes = std::size_t{4} << 20;

std::error_code errorOf(twr_status status) {
  switch (status) {
    case TWR_OK:
      return {};
    case TWR_TOO_LARGE:
      return std::make_error_code(std::errc::message_size);
    case TWR_FULL:
    case TWR_TIMED_OUT:
      return std::make_error_code(std::errc::timed_out);
    case TWR_NO_MEMORY:
      return std::make_error_code(std::errc::not_enough_memory);
    case TWR_NOT_CONNECTED:
      return std::make_error_code(std::errc::connection_reset);
    default:
      return std::make_error_code(std::errc::invalid_argument);
  }
}

}  // namespace

// Holds the answers that have arrived. The library's thread puts them, the caller's thread takes them.
class DaemonConnection::Inbox {
 public:
  enum class Wait { kArrived, kGone, kTimedOut };

  Inbox() : isOpen_(event_.open()) {}

  // False when there was no descriptor left for the event. Nothing can then be waited for.
  bool isOpen() const { return isOpen_; }
  int fileDescriptor() const { return event_.fileDescriptor(); }

  void put(AnswerHandler handler, const twr_answer& answer) {
    // The connection has ended, so this is no answer. end() reports that.
    if (answer.status != TWR_OK && answer.status != TWR_REFUSED) return;
    Answer read;
    if (answer.status == TWR_REFUSED) {
      read.error = ReplyError{answer.error_domain, answer.error_code, answer.error_message};
    } else {
      read.result =
          readValue({static_cast<const char*>(answer.result), answer.result_size}, ValuePlace::kResult);
    }
    const MutexLock lock(mutex_);
    arrived_.push_back({std::move(handler), std::move(read)});
    event_.signal();
  }

  void end() {
    const MutexLock lock(mutex_);
    isGone_ = true;
    event_.signal();
  }

  // Does not wait. kTimedOut means that there is nothing.
  Wait state() {
    const MutexLock lock(mutex_);
    if (!arrived_.empty()) return Wait::kArrived;
    return isGone_ ? Wait::kGone : Wait::kTimedOut;
  }

  Wait waitFor(milliseconds timeout) {
    const auto until = std::chrono::steady_clock::now() + timeout;
    for (;;) {
      const Wait now = state();
      const auto left = std::chrono::ceil<milliseconds>(until - std::chrono::steady_clock::now());
      if (now != Wait::kTimedOut || left <= milliseconds::zero()) return now;
      pollfd polled{event_.fileDescriptor(), POLLIN, 0};
      ::poll(&polled, 1, static_cast<int>(std::min<milliseconds::rep>(left.count(), kLongestPollMs)));
    }
  }

  std::deque<Arrival> takeAll() {
    const MutexLock lock(mutex_);
    // After the end of the connection the descriptor stays readable.
    if (!isGone_) event_.clear();
    return std::exchange(arrived_, {});
  }

 private:
  static constexpr milliseconds::rep kLongestPollMs = 60'000;

  WakeEvent event_;
  const bool isOpen_;
  Mutex mutex_;
  std::deque<Arrival> arrived_ GUARDED_BY(mutex_);
  bool isGone_ GUARDED_BY(mutex_) = false;
};

// Owns the library's client.
class DaemonConnection::Library {
 public:
  Library(const std::string& path, Inbox& inbox, End end) : inbox_(inbox), end_(end) {
    twr_client_options options{};
    options.size = sizeof(options);
    options.socket_path = path.c_str();
    options.queue_bytes = kQueueBytes;
    options.flags = TWR_CLIENT_ONCE;
    options.state_changed = [](void* context, twr_state state) {
      if (state == TWR_STATE_ENDED) static_cast<Inbox*>(context)->end();
    };
    options.context = &inbox;
    client_ = twr_client_create(&options);
  }
  Library(const Library&) = delete;
  Library& operator=(const Library&) = delete;
  ~Library() {
    const milliseconds patience = end_ == End::kAtOnce ? milliseconds::zero() : kCloseTimeout;
    twr_client_destroy(client_, static_cast<int>(patience.count()));
  }

  std::error_code connect() {
    const twr_status status = twr_client_connect(client_, static_cast<int>(kConnectTimeout.count()));
    twr_client_info info{};
    info.size = sizeof(info);
    if (status == TWR_NOT_CONNECTED && twr_client_get_info(client_, &info) == TWR_OK && info.last_error != 0)
      return {info.last_error, std::generic_category()};
    return errorOf(status);
  }

  std::error_code request(std::string_view method, const Arguments& arguments, AnswerHandler handler) {
    ValuePayload parameters;
    if (const twr_status status = parameters.set(arguments); status != TWR_OK) return errorOf(status);
    auto waiting = std::make_unique<Waiting>(Waiting{inbox_, std::move(handler)});
    const std::string name(method);
    const auto ask = [&] {
      return twr_client_request(client_, name.c_str(), parameters.get(), &Library::answered, waiting.get());
    };
    twr_status status = ask();
    if (status == TWR_FULL) {
      status = twr_client_flush(client_, static_cast<int>(kSendTimeout.count()));
      if (status == TWR_OK) status = ask();
    }
    if (status == TWR_OK) static_cast<void>(waiting.release());
    return errorOf(status);
  }

 private:
  struct Waiting {
    Inbox& inbox;
    AnswerHandler handler;
  };

  static void answered(void* context, const twr_answer* answer) {
    const std::unique_ptr<Waiting> waiting(static_cast<Waiting*>(context));
    waiting->inbox.put(std::move(waiting->handler), *answer);
  }

  Inbox& inbox_;
  const End end_;
  twr_client* client_ = nullptr;
};

DaemonConnection::DaemonConnection(End end) : end_(end) {}

DaemonConnection::~DaemonConnection() = default;

std::error_code DaemonConnection::connect(const std::vector<std::string>& paths) {
  // If a path has a socket that cannot be used, return the error of the first such path. It says more than
  // that the last path has no socket.
  std::error_code problem = std::make_error_code(std::errc::no_such_file_or_directory);
  for (const std::string& path : paths) {
    library_.reset();
    inbox_ = std::make_unique<Inbox>();
    if (!inbox_->isOpen()) {
      inbox_.reset();
      return std::make_error_code(std::errc::too_many_files_open);
    }
    library_ = std::make_unique<Library>(path, *inbox_, end_);
    const std::error_code error = library_->connect();
    if (!error) return {};
    if (problem == std::errc::no_such_file_or_directory) problem = error;
  }
  library_.reset();
  inbox_.reset();
  return problem;
}

int DaemonConnection::fileDescriptor() const { return inbox_ ? inbox_->fileDescriptor() : -1; }

std::error_code DaemonConnection::request(std::string_view method, const Arguments& arguments,
                                          AnswerHandler handler) {
  if (!library_) return std::make_error_code(std::errc::not_connected);
  return library_->request(method, arguments, std::move(handler));
}

std::error_code DaemonConnection::receive(milliseconds timeout) {
  if (!inbox_) return std::make_error_code(std::errc::not_connected);
  switch (inbox_->waitFor(timeout)) {
    case Inbox::Wait::kArrived:
      for (Arrival& arrival : inbox_->takeAll()) arrive(std::move(arrival));
      return {};
    case Inbox::Wait::kGone:
      return std::make_error_code(std::errc::connection_reset);
    case Inbox::Wait::kTimedOut:
      break;
  }
  return std::make_error_code(std::errc::timed_out);
}

}  // namespace tonewerk
