// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/DaemonCalls.h"

#include <chrono>
#include <memory>
#include <string>
#include <system_error>
#include <vector>

#include "protocol/Requests.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kAnswerTimeout{10};

// True when nothing was sent, because no frame can contain the arguments.
bool isTooLarge(const std::error_code& error) {
  return error == std::errc::message_size || error == std::errc::invalid_argument;
}

}  // namespace

bool DaemonCalls::connect(Role role) {
  const std::vector<std::string> paths = tool_.socketPaths();
  const std::error_code error = client_.connect(paths);
  if (!error) {
    // An older daemon that does not know the request answers with an error and works as before. If the
    // connection has ended, the next request fails.
    if (role == Role::kOnlooker) (void)client_.request(requests::kObserve.name, {}, {});
    return true;
  }
  std::string tried;
  for (const std::string& path : paths) tried += (tried.empty() ? "" : ", ") + path;
  tool_.status = tool_.fail(kNoDaemon, "no daemon listens on " + tried + " (" + error.message() + ")");
  return false;
}

bool DaemonCalls::call(std::string_view method, const Arguments& arguments, std::optional<Value>& result) {
  std::error_code error;
  const std::optional<Answer> answer = client_.call(method, arguments, kAnswerTimeout, error);
  if (!answer) {
    const ExitStatus status = isTooLarge(error) ? kRefused : kNoDaemon;
    tool_.status = tool_.fail(status, std::string(method) + ": " + error.message());
    return false;
  }
  if (answer->error) {
    tool_.status = tool_.fail(kRefused, describe(method, *answer->error));
    return false;
  }
  result = answer->result;
  return true;
}

std::optional<Value> DaemonCalls::await(std::string_view method, const Arguments& arguments,
                                        const std::function<bool(int descriptor)>& waitReadable,
                                        std::optional<DaemonFailure>& failure) {
  // Shared, because the handler stays when the caller gives up.
  const auto answer = std::make_shared<std::optional<Answer>>();
  std::error_code error =
      client_.request(method, arguments, [answer](const Answer& given) { *answer = given; });
  while (!error && !*answer) {
    if (!waitReadable(client_.fileDescriptor())) return std::nullopt;
    error = client_.processAnswers(std::chrono::milliseconds::zero());
  }
  if (isTooLarge(error)) {
    failure = {kRefused, std::string(method) + ": " + error.message()};
  } else if (error) {
    failure = {kNoDaemon, "the daemon has gone (" + error.message() + ")"};
  } else if ((*answer)->error) {
    failure = {kRefused, describe(method, *(*answer)->error)};
  } else {
    return (*answer)->result;
  }
  return std::nullopt;
}

std::string DaemonCalls::describe(std::string_view method, const ReplyError& error) {
  std::string text(method);
  text += ": ";
  if (!error.message.empty()) return text + error.message;
  if (error.domain == "com.orvane.audio.reporting" && error.code == 1) text += "reporting is disabled ";
  return text + "(" + error.domain + ", code " + std::to_string(error.code) + ")";
}

}  // namespace tonewerk
