// SPDX-License-Identifier: Apache-2.0
#include "support/client/ReportingClient.h"

#include <algorithm>
#include <cstdlib>
#include <optional>
#include <string>
#include <unistd.h>
#include <unordered_map>
#include <utility>

#include "platform/linux/directories/SocketPaths.h"
#include "platform/linux/messagepack/RpcLimits.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "support/client/RpcClientSocket.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;

ReplyError errorOf(const Value& value) {
  const ValueMap* map = value.asMap();
  if (map == nullptr) return ReplyError{std::string(), 0, value.text()};
  return ReplyError{map->text("domain"), map->integer("code"), map->text("message")};
}

Answer answerOf(RpcFrame& frame) {
  Answer answer;
  if (frame.error) {
    answer.error = errorOf(*frame.error);
  } else {
    answer.result = std::move(frame.result);
  }
  return answer;
}

std::error_code problemWithFrame(const std::string& frame, const Arguments& arguments) {
  if (frame.size() > kMaxFrameBytes) return std::make_error_code(std::errc::message_size);
  if (!fitsFrameDepth(arguments)) return std::make_error_code(std::errc::invalid_argument);
  return {};
}

}  // namespace

struct ReportingClient::Connection {
  RpcClientSocket socket;
  std::uint32_t nextIdentifier = 1;
  std::unordered_map<std::uint32_t, AnswerHandler> waiting;
};

ReportingClient::ReportingClient() = default;

ReportingClient::~ReportingClient() = default;

std::vector<std::string> ReportingClient::socketPaths() {
  const auto variable = [](const std::string& name) -> std::optional<std::string> {
    const char* value = std::getenv(name.c_str());
    return value == nullptr ? std::nullopt : std::optional<std::string>(value);
  };
  return socketPathsFrom(variable, ::geteuid());
}

std::error_code ReportingClient::connect(const std::vector<std::string>& paths) {
  disconnect();
  std::error_code error = std::make_error_code(std::errc::no_such_file_or_directory);
  for (const std::string& path : paths) {
    auto connection = std::make_unique<Connection>();
    error = connection->socket.connect(path, sendTimeout_);
    if (error) continue;
    connection_ = std::move(connection);
    socketPath_ = path;
    return {};
  }
  return error;
}

void ReportingClient::disconnect() {
  connection_ = nullptr;
  dropArrivals();
}

bool ReportingClient::isConnected() const { return connection_ != nullptr; }

int ReportingClient::fileDescriptor() const {
  return connection_ ? connection_->socket.fileDescriptor() : -1;
}

void ReportingClient::setSendTimeout(milliseconds timeout) { sendTimeout_ = timeout; }

std::error_code ReportingClient::request(std::string_view method, const Arguments& arguments,
                                         AnswerHandler handler) {
  if (!connection_) return std::make_error_code(std::errc::not_connected);
  const std::uint32_t identifier = connection_->nextIdentifier++;
  std::string frame;
  RpcWriter(frame).request(identifier, method, arguments);
  if (const std::error_code problem = problemWithFrame(frame, arguments)) return problem;
  connection_->waiting.insert_or_assign(identifier, std::move(handler));
  return send(frame);
}

std::error_code ReportingClient::notify(std::string_view method, const Arguments& arguments) {
  if (!connection_) return std::make_error_code(std::errc::not_connected);
  std::string frame;
  RpcWriter(frame).notification(method, arguments);
  if (const std::error_code problem = problemWithFrame(frame, arguments)) return problem;
  return send(frame);
}

std::error_code ReportingClient::send(std::string_view frame) {
  const std::error_code error = connection_->socket.send(frame, sendTimeout_);
  if (error) disconnect();  // half a frame may have been sent, and nothing can follow it
  return error;
}

std::error_code ReportingClient::receive(milliseconds timeout) {
  if (!connection_) return std::make_error_code(std::errc::not_connected);
  const std::error_code error = connection_->socket.receive(timeout);
  for (RpcFrame& frame : std::exchange(connection_->socket.arrived(), {})) {
    auto waiting = connection_->waiting.extract(frame.identifier);
    if (!waiting.empty()) arrive({std::move(waiting.mapped()), answerOf(frame)});
  }
  // Passes on the last answers before the connection fails.
  if (error && error != std::errc::timed_out && !hasArrivals()) disconnect();
  return error;
}

Arguments ReportingClient::messageArguments(ValueMap message, std::uint32_t category, std::uint16_t type,
                                            const std::vector<std::int64_t>& reporterIDs) {
  Argument recipients;
  if (!reporterIDs.empty())
    recipients = ValueArray(std::vector<Value>(reporterIDs.begin(), reporterIDs.end()));
  Arguments arguments;
  arguments.emplace_back(std::move(message));
  arguments.emplace_back(Value(category));
  arguments.emplace_back(Value(type));
  arguments.push_back(std::move(recipients));
  return arguments;
}

}  // namespace tonewerk
