// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "client/RpcClient.h"

namespace tonewerk {

// A connection over its own socket. It sends everything that fits in a frame.
class ReportingClient : public RpcClient {
 public:
  ReportingClient();
  ~ReportingClient() override;

  // Returns where a daemon may listen, in the order in which to try: only TONEWERK_REPORTING_SOCKET when it
  // is set, else the caller's own runtime directory, then the system's.
  static std::vector<std::string> socketPaths();

  // Connects to the first path on which somebody listens. It first closes an earlier connection and drops its
  // waiting handlers. The error is that of the last path tried.
  [[nodiscard]] std::error_code connect(const std::vector<std::string>& paths = socketPaths());
  void disconnect();
  bool isConnected() const;
  // Returns the path that connect() last connected to; empty before.
  const std::string& socketPath() const { return socketPath_; }

  int fileDescriptor() const override;
  // A failure ends the connection.
  [[nodiscard]] std::error_code request(std::string_view method, const Arguments& arguments,
                                        AnswerHandler handler) override;
  // Sends a request that gets no answer.
  [[nodiscard]] std::error_code notify(std::string_view method, const Arguments& arguments);
  // Sets how long to wait while the daemon reads nothing; 10 s without it.
  void setSendTimeout(std::chrono::milliseconds timeout);

  // Returns the arguments of a sendMessage request. Empty `reporterIDs` become nil, which means every started
  // session.
  static Arguments messageArguments(ValueMap message, std::uint32_t category, std::uint16_t type,
                                    const std::vector<std::int64_t>& reporterIDs);

 private:
  struct Connection;

  [[nodiscard]] std::error_code send(std::string_view frame);
  [[nodiscard]] std::error_code receive(std::chrono::milliseconds timeout) override;

  std::unique_ptr<Connection> connection_;
  std::string socketPath_;
  std::chrono::milliseconds sendTimeout_{10'000};
};

}  // namespace tonewerk
