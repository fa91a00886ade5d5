// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "tools/twctl/DaemonConnection.h"
#include "tools/twctl/Tool.h"
#include "values/Value.h"

namespace tonewerk {

// Why there is no result, and the tool's exit status for it.
struct DaemonFailure {
  ExitStatus status;
  std::string problem;
};

// Makes a command's requests to the daemon. Prints each failure and sets the tool's exit status.
class DaemonCalls {
 public:
  // `tool` outlives it.
  explicit DaemonCalls(Tool& tool) : tool_(tool) {}

  // An onlooker only reads. The daemon refuses its requests that would change something, and records nothing
  // of its connection.
  enum class Role { kClient, kOnlooker };

  // False when no daemon listens.
  [[nodiscard]] bool connect(Role role);

  // The answer's result (none for nil) in `result`. False when the request was refused or not answered.
  [[nodiscard]] bool call(std::string_view method, const Arguments& arguments, std::optional<Value>& result);

  // The same for an answer that may take long, without printing. `waitReadable` waits until the descriptor is
  // readable, or returns false to give up. None when it gave up, or on a failure, which is then in `failure`.
  [[nodiscard]] std::optional<Value> await(std::string_view method, const Arguments& arguments,
                                           const std::function<bool(int descriptor)>& waitReadable,
                                           std::optional<DaemonFailure>& failure);

  DaemonConnection& client() { return client_; }

  // "method: message (domain, code 2)".
  static std::string describe(std::string_view method, const ReplyError& error);

 private:
  Tool& tool_;
  DaemonConnection client_;
};

}  // namespace tonewerk
