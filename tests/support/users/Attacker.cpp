// SPDX-License-Identifier: Apache-2.0
#include "support/users/Attacker.h"

#include <cerrno>
#include <chrono>
#include <poll.h>
#include <stdexcept>
#include <sys/socket.h>
#include <utility>

#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/AudioEvent.h"
#include "system/support/Packed.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

constexpr int kLongFormAudio = 7;
constexpr AudioEventCategory kPlayback = 4;
constexpr milliseconds kPatience{120'000};
// When the daemon has read nothing for so long, it waits for room.
constexpr int kStandstillMilliseconds = 500;
// An array of one number.
constexpr std::string_view kSmallArray("\x91\x00", 2);

void check(const std::error_code& error, std::string_view what) {
  if (error) throw std::runtime_error(std::string(what) + ": " + error.message());
}

// The start of a sendMessage notification, up to the value of the message's only other entry.
std::string messageHead(std::int64_t number) {
  return packed::arrayHeader(3) + packed::integer(2) + packed::text("sendMessage") + packed::arrayHeader(4) +
         packed::mapHeader(2) + packed::text("n") + packed::integer(number) + packed::text("list");
}
std::string messageTail(std::int64_t reporterID) {
  return packed::integer(kPlayback) + packed::integer(kTypeError) +
         packed::array({packed::integer(reporterID)});
}

// The bytes that the socket takes at once.
std::size_t sendSome(int socket, std::string_view bytes) {
  const ssize_t count = ::send(socket, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
  if (count >= 0) return static_cast<std::size_t>(count);
  if (errno == EAGAIN || errno == EINTR) return 0;
  throw std::runtime_error("send: " + std::generic_category().message(errno));
}

// Sends the same bytes again and again over one connection.
struct Stream {
  int socket;
  std::string bytes;
  std::size_t at = 0;

  void sendMore() {
    at += sendSome(socket, std::string_view(bytes).substr(at));
    if (at == bytes.size()) at = 0;
  }
};

void startSession(ReportingClient& client, std::size_t number) {
  const Value reporterID(Attacker::kFirstReporterID + static_cast<std::int64_t>(number));
  check(client.notify("createReportingSession", {reporterID}), "create");
  check(client.notify("setServiceType", {Value(kLongFormAudio), reporterID}), "service");
  check(client.notify("startReportingSessionForID", {reporterID}), "start");
}

// Messages for one session that differ from each other, so that none is redundant.
std::string floodOf(std::int64_t reporterID) {
  constexpr int kDifferent = 100;
  std::string bytes;
  for (int number = 0; number < kDifferent; ++number) {
    RpcWriter(bytes).notification(
        "sendMessage",
        ReportingClient::messageArguments({{"number", number}, {"volume", 0.5}, {"route", "Speaker"}},
                                          kPlayback, kTypeError, {reporterID}));
  }
  return bytes;
}

}  // namespace

void Attacker::openSessions(std::size_t count) {
  client_ = connect();
  for (std::size_t at = 0; at < count; ++at) startSession(*client_, at);
  waitUntilServed();
}

void Attacker::sendToOneSessionOften(std::size_t bytes, std::size_t times) {
  sendMessage({{"n", sent_++}, {"text", std::string(bytes, 'x')}},
              std::vector<std::int64_t>(times, kFirstReporterID));
}

void Attacker::broadcast(std::size_t bytes) {
  sendMessage({{"n", sent_++}, {"text", std::string(bytes, 'x')}}, {});
}

void Attacker::sendLarge(std::size_t bytes) {
  sendMessage({{"n", sent_++}, {"text", std::string(bytes, 'x')}}, {kFirstReporterID});
}

void Attacker::sendNested() {
  const std::string head = messageHead(sent_++);
  const std::string tail = messageTail(kFirstReporterID);
  constexpr std::size_t kHeaderBytes = 5;
  const std::size_t count = (kMaxFrameBytes - head.size() - tail.size() - kHeaderBytes) / kSmallArray.size();
  std::string frame = head + packed::arrayHeader(static_cast<std::uint32_t>(count));
  for (std::size_t at = 0; at < count; ++at) frame += kSmallArray;
  send(frame + tail);
}

void Attacker::nameUnknown(std::size_t count) {
  constexpr std::int64_t kFirstUnknown = 5'000'000;
  std::vector<std::int64_t> unknown(count);
  for (std::size_t at = 0; at < count; ++at) unknown[at] = kFirstUnknown + static_cast<std::int64_t>(at);
  sendMessage({{"n", sent_++}}, unknown);
}

void Attacker::openFlood(std::size_t connections) {
  for (std::size_t at = 0; at < connections; ++at) {
    others_.push_back(connect());
    startSession(*others_.back(), at);
    floods_.push_back(floodOf(kFirstReporterID + static_cast<std::int64_t>(at)));
  }
}

void Attacker::flood() {
  std::vector<Stream> streams;
  std::vector<pollfd> polled;
  for (std::size_t at = 0; at < others_.size(); ++at) {
    const int socket = others_[at]->fileDescriptor();
    streams.push_back({socket, floods_[at]});
    polled.push_back({socket, POLLOUT, 0});
  }
  for (;;) {
    if (::poll(polled.data(), polled.size(), -1) < 0 && errno != EINTR) throw std::runtime_error("poll");
    for (std::size_t at = 0; at < streams.size(); ++at) {
      if (polled[at].revents != 0) streams[at].sendMore();
    }
  }
}

std::size_t Attacker::leaveUnfinished(std::size_t connections) {
  std::string frame = messageHead(0) + packed::arrayHeader(kMaxFrameBytes);
  while (frame.size() + kSmallArray.size() < kMaxFrameBytes) frame += kSmallArray;
  std::vector<Stream> streams;
  for (std::size_t at = 0; at < connections; ++at) {
    others_.push_back(connect());
    streams.push_back({others_.back()->fileDescriptor(), frame});
  }
  std::size_t taken = 0;
  for (;;) {
    std::vector<pollfd> polled;
    std::vector<Stream*> unsent;
    for (Stream& stream : streams) {
      if (stream.at == frame.size()) continue;
      polled.push_back({stream.socket, POLLOUT, 0});
      unsent.push_back(&stream);
    }
    if (unsent.empty() || ::poll(polled.data(), polled.size(), kStandstillMilliseconds) <= 0) return taken;
    for (std::size_t at = 0; at < unsent.size(); ++at) {
      if (polled[at].revents == 0) continue;
      const std::string_view rest = std::string_view(frame).substr(unsent[at]->at);
      const std::size_t count = sendSome(unsent[at]->socket, rest);
      unsent[at]->at += count;
      taken += count;
    }
  }
}

std::size_t Attacker::connectAsOftenAsPossible(std::size_t most) {
  constexpr milliseconds kShort{500};
  std::size_t answered = 0;
  for (std::size_t at = 0; at < most; ++at) {
    auto client = std::make_unique<ReportingClient>();
    client->setSendTimeout(kShort);
    if (client->connect({socketPath_})) return answered;
    others_.push_back(std::move(client));
    // Those whom the daemon has not let in stay in the queue of the socket.
    std::error_code error;
    if (others_.back()->call("getServiceNameForReporterID", {Value(1)}, kShort, error)) ++answered;
  }
  return answered;
}

std::optional<Answer> Attacker::ask(std::string_view method, const Arguments& arguments) {
  others_.push_back(connect());
  std::error_code error;
  return others_.back()->call(method, arguments, kPatience, error);
}

void Attacker::waitUntilServed() {
  std::error_code error;
  if (!client_->call("getServiceNameForReporterID", {Value(kFirstReporterID)}, kPatience, error)) {
    throw std::runtime_error("no answer: " + error.message());
  }
}

Attacker::Client Attacker::connect() const {
  auto client = std::make_unique<ReportingClient>();
  client->setSendTimeout(kPatience);
  check(client->connect({socketPath_}), "cannot connect");
  return client;
}

void Attacker::send(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t count = ::send(client_->fileDescriptor(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (count < 0 && errno != EINTR)
      throw std::runtime_error("send: " + std::generic_category().message(errno));
    if (count > 0) bytes.remove_prefix(static_cast<std::size_t>(count));
  }
}

void Attacker::sendMessage(ValueMap message, const std::vector<std::int64_t>& reporterIDs) {
  check(client_->notify("sendMessage", ReportingClient::messageArguments(std::move(message), kPlayback,
                                                                         kTypeError, reporterIDs)),
        "sendMessage");
}

}  // namespace tonewerk
