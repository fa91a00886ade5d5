// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/HttpServer.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <fcntl.h>
#include <microhttpd.h>
#include <netinet/in.h>
#include <optional>
#include <string_view>
#include <sys/socket.h>
#include <system_error>
#include <utility>

namespace tonewerk {
namespace {

constexpr std::size_t kPartBytes = std::size_t{64} << 10U;
constexpr std::array<std::pair<const char*, const char*>, 7> kHeaders{
    {{"X-Content-Type-Options", "nosniff"},
     {"X-Frame-Options", "DENY"},
     {"Referrer-Policy", "no-referrer"},
     {"Cache-Control", "no-store"},
     {"Cross-Origin-Resource-Policy", "same-origin"},
     {"Cross-Origin-Opener-Policy", "same-origin"},
     {"Allow", "GET, HEAD"}}};

std::string problemOf(const char* what) {
  return std::string(what) + ": " + std::generic_category().message(errno);
}

// Passes an answer's parts on as the library asks for them.
struct PartsReader {
  PageAnswer::Parts parts;
  std::string part;
  std::size_t sent = 0;
};

ssize_t readPart(void* context, std::uint64_t /*position*/, char* buffer, std::size_t most) {
  auto& reader = *static_cast<PartsReader*>(context);
  if (reader.sent == reader.part.size()) {
    reader.part = reader.parts();
    reader.sent = 0;
  }
  if (reader.part.empty()) return MHD_CONTENT_READER_END_OF_STREAM;
  const std::size_t count = std::min(most, reader.part.size() - reader.sent);
  reader.part.copy(buffer, count, reader.sent);
  reader.sent += count;
  return static_cast<ssize_t>(count);
}

void deleteReader(void* context) { delete static_cast<PartsReader*>(context); }

// The library keeps the text alive by this reference.
ssize_t readWhole(void* context, std::uint64_t position, char* buffer, std::size_t most) {
  const std::string& text = **static_cast<std::shared_ptr<const std::string>*>(context);
  const std::size_t count = std::min<std::size_t>(most, text.size() - position);
  if (count == 0) return MHD_CONTENT_READER_END_OF_STREAM;
  text.copy(buffer, count, position);
  return static_cast<ssize_t>(count);
}

void deleteText(void* context) { delete static_cast<std::shared_ptr<const std::string>*>(context); }

// Null without memory.
MHD_Response* responseOf(PageAnswer answer) {
  if (answer.parts) {
    auto reader = std::make_unique<PartsReader>(PartsReader{std::move(answer.parts), {}, 0});
    MHD_Response* made = MHD_create_response_from_callback(MHD_SIZE_UNKNOWN, kPartBytes, &readPart,
                                                           reader.get(), &deleteReader);
    if (made != nullptr) static_cast<void>(reader.release());
    return made;
  }
  if (answer.whole == nullptr) answer.whole = std::make_shared<const std::string>();
  auto text = std::make_unique<std::shared_ptr<const std::string>>(std::move(answer.whole));
  MHD_Response* made =
      MHD_create_response_from_callback((*text)->size(), kPartBytes, &readWhole, text.get(), &deleteText);
  if (made != nullptr) static_cast<void>(text.release());
  return made;
}

MHD_Result send(MHD_Connection* connection, PageAnswer answer) {
  const unsigned int status = answer.status;
  const std::string type = answer.type;
  const std::string policy = answer.policy;
  MHD_Response* response = responseOf(std::move(answer));
  if (response == nullptr) return MHD_NO;
  MHD_add_response_header(response, "Content-Type", type.c_str());
  MHD_add_response_header(response, "Content-Security-Policy", policy.c_str());
  for (const auto& [name, value] : kHeaders) MHD_add_response_header(response, name, value);
  const MHD_Result queued = MHD_queue_response(connection, status, response);
  MHD_destroy_response(response);
  return queued;
}

// The values of a header in a request.
struct FoundHeader {
  std::string_view name;
  std::optional<std::string_view> value;
  int count = 0;
};

bool isSameName(std::string_view a, std::string_view b) {
  const auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; };
  return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                    [&](char x, char y) { return lower(x) == lower(y); });
}

MHD_Result noteHeader(void* context, MHD_ValueKind /*kind*/, const char* key, const char* value) {
  auto& found = *static_cast<FoundHeader*>(context);
  if (!isSameName(key, found.name)) return MHD_YES;
  found.value = value == nullptr ? "" : value;
  ++found.count;
  return MHD_YES;
}

FoundHeader headerOf(MHD_Connection* connection, std::string_view name) {
  FoundHeader found{name, std::nullopt, 0};
  MHD_get_connection_values(connection, MHD_HEADER_KIND, &noteHeader, &found);
  if (found.count > 1) found.value.reset();
  return found;
}

// What a client does wrong is no problem of ours, so nothing is logged.
void ignoreMessage(void* /*context*/, const char* /*format*/, va_list /*arguments*/) {}

}  // namespace

struct HttpServer::Callbacks {
  static MHD_Result answer(void* context, MHD_Connection* connection, const char* path, const char* method,
                           const char* /*version*/, const char* /*upload*/, std::size_t* uploaded,
                           void** /*state*/) {
    const auto& server = *static_cast<const HttpServer*>(context);
    PageRequest request;
    request.method = method;
    request.path = path;
    if (const char* token = MHD_lookup_connection_value(connection, MHD_GET_ARGUMENT_KIND, "token")) {
      request.token = token;
    }
    request.host = headerOf(connection, "Host").value;
    const FoundHeader origin = headerOf(connection, "Origin");
    request.origin = origin.value;
    request.hasOrigin = origin.count > 0;
    const std::string_view length = headerOf(connection, "Content-Length").value.value_or("0");
    request.hasBody = length != "0" || headerOf(connection, "Transfer-Encoding").count > 0 || *uploaded > 0;
    // The answer comes before the body, which is therefore not read: the library closes the connection.
    return send(connection, server.handler_(request));
  }
};

HttpServer::~HttpServer() { stop(); }

std::string HttpServer::listen(std::uint16_t port) {
  socket_.reset(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!socket_) return problemOf("socket");
  // A port is free at once after the end of the server that had it.
  const int yes = 1;
  ::setsockopt(socket_.get(), SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  address.sin_port = htons(port);
  socklen_t size = sizeof address;
  auto* generic = reinterpret_cast<sockaddr*>(&address);
  if (::bind(socket_.get(), generic, size) != 0 || ::listen(socket_.get(), SOMAXCONN) != 0) {
    return problemOf(("127.0.0.1:" + std::to_string(port)).c_str());
  }
  if (::getsockname(socket_.get(), generic, &size) != 0) return problemOf("getsockname");
  port_ = ntohs(address.sin_port);
  return {};
}

std::string HttpServer::start(Handler handler) {
  handler_ = std::move(handler);
  // The library closes the descriptor that it gets.
  const int listening = ::fcntl(socket_.get(), F_DUPFD_CLOEXEC, 0);
  if (listening < 0) return problemOf("fcntl");
  daemon_ = MHD_start_daemon(
      MHD_USE_INTERNAL_POLLING_THREAD | MHD_USE_THREAD_PER_CONNECTION | MHD_USE_POLL | MHD_USE_ERROR_LOG,
      port_, nullptr, nullptr, &Callbacks::answer, this, MHD_OPTION_EXTERNAL_LOGGER, &ignoreMessage, nullptr,
      MHD_OPTION_LISTEN_SOCKET, listening, MHD_OPTION_CONNECTION_LIMIT, kMostConnections,
      MHD_OPTION_CONNECTION_MEMORY_LIMIT, kMostRequestBytes, MHD_OPTION_CONNECTION_TIMEOUT, kSilenceSeconds,
      MHD_OPTION_END);
  return daemon_ == nullptr ? "the HTTP server does not start" : std::string();
}

void HttpServer::stop() {
  if (daemon_ == nullptr) return;
  MHD_stop_daemon(daemon_);
  daemon_ = nullptr;
  socket_.reset();
}

}  // namespace tonewerk
