// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/Daemon.h"

#include <chrono>
#include <string>
#include <system_error>
#include <vector>

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kAnswerTimeout{10};

}  // namespace

bool Daemon::connect() {
  const std::vector<std::string> paths = tool_.socketPaths();
  const std::error_code error = client_.connect(paths);
  if (!error) return true;
  std::string tried;
  for (const std::string& path : paths) tried += (tried.empty() ? "" : ", ") + path;
  tool_.status = tool_.fail(kNoDaemon, "no daemon listens on " + tried + " (" + error.message() + ")");
  return false;
}

bool Daemon::call(std::string_view method, const Arguments& arguments, std::optional<Value>& result) {
  std::error_code error;
  const std::optional<Answer> answer = client_.call(method, arguments, kAnswerTimeout, error);
  if (!answer) {
    // The client refuses what no frame can carry before anything is sent.
    const bool tooLarge = error == std::errc::message_size || error == std::errc::invalid_argument;
    const ExitStatus status = tooLarge ? kRefused : kNoDaemon;
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

std::string Daemon::describe(std::string_view method, const ReplyError& error) {
  std::string text(method);
  text += ": ";
  if (!error.message.empty()) return text + error.message;
  if (error.domain == "com.orvane.audio.reporting" && error.code == 1) text += "reporting is disabled ";
  return text + "(" + error.domain + ", code " + std::to_string(error.code) + ")";
}

}  // namespace tonewerk
