// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "client/RpcClient.h"

namespace tonewerk {

// Connects through the client library. Answers arrive on the library's thread and wait until the caller takes
// them.
class DaemonConnection : public RpcClient {
 public:
  // What a connection's end waits for.
  enum class End {
    kAnswered,  // that the daemon has answered, for at most 1 s
    kAtOnce,    // nothing: for those who only read
  };

  explicit DaemonConnection(End end = End::kAnswered);
  ~DaemonConnection() override;

  // Connects to the first path on which a daemon listens. May be called once. The error is that of the first
  // path at which there is a socket, otherwise std::errc::no_such_file_or_directory.
  [[nodiscard]] std::error_code connect(const std::vector<std::string>& paths);

  int fileDescriptor() const override;
  [[nodiscard]] std::error_code request(std::string_view method, const Arguments& arguments,
                                        AnswerHandler handler) override;

 private:
  class Inbox;
  class Library;

  [[nodiscard]] std::error_code receive(std::chrono::milliseconds timeout) override;

  const End end_;
  std::unique_ptr<Inbox> inbox_;  // outlives the library's client, which puts answers into it
  std::unique_ptr<Library> library_;
};

}  // namespace tonewerk
