// SPDX-License-Identifier: Apache-2.0
#include "IngestClients.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <poll.h>
#include <stdexcept>
#include <sys/socket.h>
#include <sys/un.h>
#include <utility>

namespace tonewerk {
namespace {

constexpr int kTimeoutMilliseconds = 30'000;
constexpr char kNil = '\xc0';

[[noreturn]] void fail(const std::string& what) { throw std::runtime_error(what); }
[[noreturn]] void failWithErrno(const std::string& what) { fail(what + ": " + std::strerror(errno)); }

FileDescriptor connectTo(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof(address.sun_path)) fail("the socket's path is too long");
  std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
  FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (::connect(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) {
    failWithErrno("cannot connect to " + path);
  }
  return socket;
}

void waitFor(std::vector<pollfd>& sockets) {
  const int ready = ::poll(sockets.data(), sockets.size(), kTimeoutMilliseconds);
  if (ready == 0) fail("the server has stopped answering");
  if (ready < 0 && errno != EINTR) failWithErrno("poll");
}

}  // namespace

IngestClients::IngestClients(const std::string& socketPath, std::vector<IngestClientPlan> plans,
                             std::int64_t serviceType) {
  clients_.reserve(plans.size());
  for (IngestClientPlan& plan : plans) {
    clients_.push_back({connectTo(socketPath), std::move(plan), "", 0, 0, 0, ""});
    Client& client = clients_.back();
    for (std::size_t at = 0; at < client.plan.sessions; ++at) {
      const std::int64_t reporterID = client.plan.firstReporterID + static_cast<std::int64_t>(at);
      request(client, IngestMessages::opening(reporterID, serviceType));
    }
  }
}

void IngestClients::send(std::size_t messagesAClient, const Pace& pace) {
  for (Client& client : clients_) client.sent = client.answered = 0;
  std::vector<pollfd> sockets(clients_.size());
  for (;;) {
    bool isDone = true;
    for (std::size_t at = 0; at < clients_.size(); ++at) {
      Client& client = clients_[at];
      sendSome(client, messagesAClient, pace);
      const bool isAnswered = client.answered == messagesAClient;
      isDone = isDone && isAnswered;
      const int wanted = client.unsent.empty() ? POLLIN : POLLIN | POLLOUT;
      sockets[at] = {isAnswered ? -1 : client.socket.get(), static_cast<short>(wanted), 0};
    }
    if (isDone) return;
    waitFor(sockets);
    for (std::size_t at = 0; at < clients_.size(); ++at) {
      if ((sockets[at].revents & (POLLIN | POLLHUP | POLLERR)) != 0) takeAnswers(clients_[at]);
    }
  }
}

void IngestClients::stop() {
  for (Client& client : clients_) {
    for (std::size_t at = 0; at < client.plan.sessions; ++at) {
      request(client, IngestMessages::closing(client.plan.firstReporterID + static_cast<std::int64_t>(at)));
    }
  }
}

// Sends bytes that get one answer, and waits for the answer.
void IngestClients::request(Client& client, const std::string& bytes) {
  client.sent = 1;
  client.answered = 0;
  if (::send(client.socket.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL) !=
      static_cast<ssize_t>(bytes.size())) {
    failWithErrno("send");
  }
  std::vector<pollfd> socket{{client.socket.get(), POLLIN, 0}};
  while (client.answered == 0) {
    waitFor(socket);
    takeAnswers(client);
  }
}

// Sends as many messages as the window has room for, but only once half of the window is free. Otherwise each
// answer would be followed by one message, which is the same as waiting for each answer.
void IngestClients::sendSome(Client& client, std::size_t messages, const Pace& pace) {
  if (!client.unsent.empty() && !write(client)) return;
  std::size_t room = std::min(messages - client.sent, pace.window - (client.sent - client.answered));
  if (room < messages - client.sent && room * 2 < pace.window) return;
  IngestMessages& all = client.plan.messages;
  while (room > 0) {
    const std::size_t count = std::min({room, pace.messagesAWrite, all.count() - client.place});
    const std::size_t from = client.place == 0 ? 0 : all.endOf(client.place - 1);
    const std::size_t end = all.endOf(client.place + count - 1);
    client.unsent.assign(all.bytes(), from, end - from);
    stored_ += all.storedOfFirst(client.place + count) - all.storedOfFirst(client.place);
    client.place = (client.place + count) % all.count();
    if (client.place == 0) all.advanceTimes();
    client.sent += count;
    room -= count;
    if (!write(client)) return;
  }
}

// False while the socket has not taken all bytes.
bool IngestClients::write(Client& client) {
  const ssize_t taken =
      ::send(client.socket.get(), client.unsent.data(), client.unsent.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
  if (taken < 0 && errno != EAGAIN && errno != EINTR) failWithErrno("send");
  if (taken > 0) client.unsent.erase(0, static_cast<std::size_t>(taken));
  return client.unsent.empty();
}

void IngestClients::takeAnswers(Client& client) {
  std::array<char, 16384> buffer;
  const ssize_t count = ::recv(client.socket.get(), buffer.data(), buffer.size(), MSG_DONTWAIT);
  if (count == 0) fail("the server has closed the connection");
  if (count < 0) {
    if (errno == EAGAIN || errno == EINTR) return;
    failWithErrno("recv");
  }
  client.answers.append(buffer.data(), static_cast<std::size_t>(count));
  constexpr std::size_t kErrorPlace = IngestMessages::kAnswerBytes - 2;
  std::size_t at = 0;
  for (; client.answers.size() - at >= IngestMessages::kAnswerBytes; at += IngestMessages::kAnswerBytes) {
    if (client.answers[at + kErrorPlace] != kNil) fail("the server has refused a request");
    ++client.answered;
  }
  client.answers.erase(0, at);
}

}  // namespace tonewerk
