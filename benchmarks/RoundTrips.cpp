// SPDX-License-Identifier: Apache-2.0
#include "RoundTrips.h"

#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <sys/socket.h>
#include <sys/time.h>
#include <thread>
#include <vector>

#include "MessageLoad.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kWindow = 256;
constexpr std::size_t kMeasuredEvery = 100;
constexpr timeval kTimeout{30, 0};

[[noreturn]] void fail(const char* what) {
  throw std::runtime_error(std::string(what) + ": " + std::strerror(errno));
}

FileDescriptor connectTo(const std::string& path) {
  const std::optional<sockaddr_un> address = unixAddressOf(path);
  FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (!address || ::connect(socket.get(), generic(*address), sizeof(*address)) != 0) fail("cannot connect");
  ::setsockopt(socket.get(), SOL_SOCKET, SO_RCVTIMEO, &kTimeout, sizeof(kTimeout));
  ::setsockopt(socket.get(), SOL_SOCKET, SO_SNDTIMEO, &kTimeout, sizeof(kTimeout));
  return socket;
}

bool write(int socket, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t taken = ::send(socket, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (taken < 0 && errno != EINTR) return false;
    if (taken > 0) bytes.remove_prefix(static_cast<std::size_t>(taken));
  }
  return true;
}

// Requests are answered in the order in which they are sent, so their numbers match the answers to them.
class Flood {
 public:
  Flood(const std::string& socketPath, const IngestClientPlan& plan, std::size_t count)
      : socket_(connectTo(socketPath)),
        messages_(plan.messages),
        count_(count),
        sentAt_(count / kMeasuredEvery + 1) {
    RpcWriter(request_).request(IngestMessages::kFirstIdentifier, "getServiceNameForReporterID",
                                {Value(plan.firstReporterID)});
    for (std::size_t at = 0; at < plan.sessions; ++at) {
      open(IngestMessages::opening(plan.firstReporterID + static_cast<std::int64_t>(at), kMeasuredService));
    }
  }

  Latencies run() {
    Latencies latencies(sentAt_.size());
    std::thread sender([this] { send(); });
    try {
      receive(latencies);
    } catch (...) {
      answered_ = count_ + kWindow;  // the sender no longer waits for answers
      answered_.notify_all();
      ::shutdown(socket_.get(), SHUT_RDWR);
      sender.join();
      throw;
    }
    sender.join();
    latencies.sort();
    return latencies;
  }

 private:
  void open(const std::string& bytes) {
    std::array<char, IngestMessages::kAnswerBytes> answer;
    if (!write(socket_.get(), bytes)) fail("send");
    const ssize_t size = ::recv(socket_.get(), answer.data(), answer.size(), MSG_WAITALL);
    if (size != static_cast<ssize_t>(answer.size())) fail("cannot open a session");
  }

  void send() {
    for (std::size_t number = 0; number < count_; ++number) {
      for (std::size_t answered = answered_; number >= answered + kWindow; answered = answered_) {
        answered_.wait(answered);
      }
      const bool isMeasured = number % kMeasuredEvery == 0;
      if (isMeasured) sentAt_[number / kMeasuredEvery] = Clock::now().time_since_epoch().count();
      if (!write(socket_.get(), isMeasured ? std::string_view(request_) : messageAt(number))) return;
    }
  }

  std::string_view messageAt(std::size_t number) const {
    const std::size_t place = number % messages_.count();
    const std::size_t from = place == 0 ? 0 : messages_.endOf(place - 1);
    return std::string_view(messages_.bytes()).substr(from, messages_.endOf(place) - from);
  }

  void receive(Latencies& latencies) {
    std::array<char, 16384> buffer;
    std::size_t held = 0;  // bytes of an answer that is not complete yet
    for (std::size_t number = 0; number < count_;) {
      const ssize_t size = ::recv(socket_.get(), buffer.data() + held, buffer.size() - held, 0);
      if (size == 0) throw std::runtime_error("the server has closed the connection");
      if (size < 0 && errno == EINTR) continue;
      if (size < 0) fail("recv");
      const auto now = Clock::now().time_since_epoch().count();
      held += static_cast<std::size_t>(size);
      std::size_t at = 0;
      for (; held - at >= IngestMessages::kAnswerBytes; at += IngestMessages::kAnswerBytes, ++number) {
        if (buffer[at + IngestMessages::kAnswerBytes - 2] != '\xc0') {
          throw std::runtime_error("the server has refused a request");
        }
        if (number % kMeasuredEvery == 0) latencies.add(now - sentAt_[number / kMeasuredEvery]);
      }
      held -= at;
      std::memmove(buffer.data(), buffer.data() + at, held);
      answered_ = number;
      answered_.notify_one();
    }
  }

  FileDescriptor socket_;
  const IngestMessages& messages_;
  std::size_t count_;
  std::string request_;  // its answer is as long as a message's, because a service's number takes one byte
  std::atomic<std::size_t> answered_ = 0;
  // When each measured request was sent. It is written before the request is sent, so before it is answered.
  std::vector<std::atomic<Clock::rep>> sentAt_;
};

}  // namespace

Latencies measureRoundTrips(const std::string& socketPath, const IngestClientPlan& plan, std::size_t count) {
  return Flood(socketPath, plan, count).run();
}

}  // namespace tonewerk
