// SPDX-License-Identifier: Apache-2.0
#include "support/OtlpReceiver.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cctype>
#include <chrono>
#include <cstdlib>
#include <netinet/in.h>
#include <poll.h>
#include <string_view>
#include <sys/socket.h>
#include <tuple>
#include <unistd.h>
#include <utility>
#include <zlib.h>

#include "support/OtlpSchema.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kTimeout{20};
constexpr std::size_t kHugeBytes = 100'000'000;
constexpr std::size_t kMaxRequestBytes = std::size_t{20} << 20;

// Returns a listening socket on a free port of the loopback interface, and the port, which is 0 on failure.
std::pair<int, int> listenOnLoopback() {
  const int descriptor = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t size = sizeof(address);
  const bool listens = bind(descriptor, reinterpret_cast<sockaddr*>(&address), size) == 0 &&
                       listen(descriptor, 16) == 0 &&
                       getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &size) == 0;
  return {descriptor, listens ? ntohs(address.sin_port) : 0};
}

[[nodiscard]] bool sendAll(int connection, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t sent = ::send(connection, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent <= 0) return false;
    bytes.remove_prefix(static_cast<std::size_t>(sent));
  }
  return true;
}

std::string lowerCase(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return text;
}

std::string valueOf(const OtlpReceiver::Request& request, const std::string& header) {
  const auto found = request.headers.find(header);
  return found == request.headers.end() ? std::string() : found->second;
}

// Sets the parts of the request that precede the body.
void parseHead(std::string_view head, OtlpReceiver::Request& request) {
  std::size_t at = head.find("\r\n");
  request.line = head.substr(0, at);
  while (at != std::string_view::npos && at + 2 < head.size()) {
    const std::size_t end = head.find("\r\n", at + 2);
    const std::string_view line = head.substr(at + 2, end == std::string_view::npos ? end : end - at - 2);
    const std::size_t colon = line.find(':');
    if (colon != std::string_view::npos) {
      std::string_view value = line.substr(colon + 1);
      while (!value.empty() && value.front() == ' ') value.remove_prefix(1);
      request.headers[lowerCase(std::string(line.substr(0, colon)))] = value;
    }
    at = end;
  }
}

// Sets `body` to the unpacked body. Returns false when `packed` is not gzip.
[[nodiscard]] bool unpack(const std::string& packed, std::string& body) {
  z_stream stream{};
  if (inflateInit2(&stream, 15 + 16) != Z_OK) return false;
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(packed.data()));
  stream.avail_in = static_cast<uInt>(packed.size());
  int result = Z_OK;
  while (result == Z_OK) {
    char piece[16384];
    stream.next_out = reinterpret_cast<Bytef*>(piece);
    stream.avail_out = sizeof(piece);
    result = inflate(&stream, Z_NO_FLUSH);
    body.append(piece, sizeof(piece) - stream.avail_out);
  }
  const bool isWhole = result == Z_STREAM_END && stream.avail_in == 0;
  inflateEnd(&stream);
  return isWhole;
}

}  // namespace

OtlpReceiver::OtlpReceiver() {
  std::tie(listener_, port_) = listenOnLoopback();
  int ends[2] = {-1, -1};
  if (pipe(ends) == 0) {
    wakeRead_ = ends[0];
    wakeWrite_ = ends[1];
  }
  thread_ = std::thread([this] { run(); });
}

OtlpReceiver::~OtlpReceiver() {
  close(wakeWrite_);
  thread_.join();
  close(wakeRead_);
  close(listener_);
}

std::string OtlpReceiver::address() const { return "http://127.0.0.1:" + std::to_string(port_); }

std::string OtlpReceiver::deadAddress() {
  const auto [descriptor, port] = listenOnLoopback();
  close(descriptor);
  return "http://127.0.0.1:" + std::to_string(port);
}

void OtlpReceiver::answerNext(Answer answer) {
  const MutexLock lock(mutex_);
  answers_.push_back(std::move(answer));
}

bool OtlpReceiver::waitForRequests(std::size_t count) {
  const auto end = std::chrono::steady_clock::now() + kTimeout;
  MutexLock lock(mutex_);
  while (requests_.size() < count && arrived_.waitUntil(lock, end)) {
  }
  return requests_.size() >= count;
}

std::vector<OtlpReceiver::Request> OtlpReceiver::requests() const {
  const MutexLock lock(mutex_);
  return requests_;
}

std::vector<nlohmann::json> OtlpReceiver::records() const {
  std::vector<nlohmann::json> records;
  for (const Request& request : requests()) {
    const nlohmann::json json = request.json();
    for (const auto& resourceLogs : json["resourceLogs"]) {
      for (const auto& scopeLogs : resourceLogs["scopeLogs"]) {
        for (const auto& record : scopeLogs["logRecords"]) records.push_back(record);
      }
    }
  }
  return records;
}

std::vector<std::string> OtlpReceiver::problems() const {
  const MutexLock lock(mutex_);
  return problems_;
}

void OtlpReceiver::run() {
  while (waitReadable(listener_)) {
    const int connection = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
    if (connection < 0) continue;
    serve(connection);
    close(connection);
  }
}

void OtlpReceiver::serve(int connection) {
  Request request;
  if (!readRequest(connection, request)) return;
  check(request);
  Answer answer;
  {
    const MutexLock lock(mutex_);
    requests_.push_back(std::move(request));
    if (!answers_.empty()) {
      answer = std::move(answers_.front());
      answers_.pop_front();
    }
    arrived_.notifyAll();
  }
  send(connection, answer);
}

bool OtlpReceiver::readRequest(int connection, Request& request) {
  std::string bytes;
  std::size_t bodyAt = std::string::npos;
  std::size_t length = 0;
  while (bodyAt == std::string::npos || bytes.size() < bodyAt + length) {
    char piece[65536];
    if (!waitReadable(connection)) return false;
    const ssize_t count = recv(connection, piece, sizeof(piece), 0);
    if (count <= 0 || bytes.size() > kMaxRequestBytes) return false;
    bytes.append(piece, static_cast<std::size_t>(count));
    if (bodyAt != std::string::npos) continue;
    const std::size_t headEnd = bytes.find("\r\n\r\n");
    if (headEnd == std::string::npos) continue;
    parseHead(std::string_view(bytes).substr(0, headEnd), request);
    bodyAt = headEnd + 4;
    length = std::strtoul(valueOf(request, "content-length").c_str(), nullptr, 10);
  }
  request.body = bytes.substr(bodyAt, length);
  return true;
}

// Also unpacks the body.
void OtlpReceiver::check(Request& request) {
  std::vector<std::string> found;
  if (request.line != "POST /v1/logs HTTP/1.1") found.push_back("request line: " + request.line);
  if (valueOf(request, "content-type") != "application/json") found.emplace_back("content type");
  if (!valueOf(request, "expect").empty()) found.emplace_back("asks before it sends");
  if (valueOf(request, "content-encoding") == "gzip") {
    std::string body;
    if (!unpack(request.body, body)) found.emplace_back("no gzip");
    request.body = std::move(body);
  }
  const std::vector<std::string> schema = problemsOfOtlpLogs(request.body);
  found.insert(found.end(), schema.begin(), schema.end());
  const MutexLock lock(mutex_);
  problems_.insert(problems_.end(), found.begin(), found.end());
}

void OtlpReceiver::send(int connection, const Answer& answer) {
  const std::string statusLine = "HTTP/1.1 " + std::to_string(answer.status) + " X\r\n";
  switch (answer.fault) {
    case Fault::kHang:
      return waitForPeer(connection);
    case Fault::kCloseEarly:
      return;
    case Fault::kGarbage:
      (void)sendAll(connection, "\x16\x03\x01 what? \r\n\r\n");  // the peer may already be gone
      return;
    case Fault::kHugeBody:
      return sendForever(connection, statusLine + "Content-Length: 100000000\r\n\r\n");
    case Fault::kHugeHeader:
      return sendForever(connection, statusLine);
    case Fault::kNone:
    case Fault::kCutBody:
      break;
  }
  const std::size_t more = answer.fault == Fault::kCutBody ? 10 : 0;
  std::string text = statusLine +
                     "Connection: close\r\nContent-Length: " + std::to_string(answer.body.size() + more) +
                     "\r\n";
  for (const std::string& header : answer.headers) text += header + "\r\n";
  (void)sendAll(connection, text + "\r\n" + answer.body);  // the peer may already be gone
}

// Sends until the peer closes the connection, at most kHugeBytes.
void OtlpReceiver::sendForever(int connection, const std::string& beginning) {
  std::string line = "X-Filler: " + std::string(8000, 'x') + "\r\n";
  if (!sendAll(connection, beginning)) return;
  for (std::size_t sent = 0; sent < kHugeBytes; sent += line.size()) {
    if (!sendAll(connection, line)) return;
  }
}

void OtlpReceiver::waitForPeer(int connection) {
  char byte = 0;
  while (waitReadable(connection) && recv(connection, &byte, 1, 0) > 0) {
  }
}

// Returns false when the receiver is being destroyed.
bool OtlpReceiver::waitReadable(int descriptor) {
  pollfd waited[2] = {{descriptor, POLLIN, 0}, {wakeRead_, POLLIN, 0}};
  return poll(waited, 2, -1) > 0 && waited[1].revents == 0;
}

}  // namespace tonewerk
