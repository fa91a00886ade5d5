// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <deque>
#include <string>
#include <string_view>
#include <system_error>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/messagepack/RpcFrame.h"
#include "platform/linux/messagepack/RpcFrameReader.h"

namespace tonewerk {

// The client's end of the protocol's socket: frames out, frames in. One thread. After a failure other than
// std::errc::timed_out of receive() the connection is of no more use.
class RpcClientSocket {
 public:
  RpcClientSocket() : reader_(texts_) {}

  // Waits, at most `timeout`, while the daemon has a full queue of clients to accept.
  [[nodiscard]] std::error_code connect(const std::string& path, std::chrono::milliseconds timeout);

  int fileDescriptor() const { return socket_.get(); }

  // Writes all of `frame`. While the daemon reads nothing, what it sends is taken in, so that neither waits
  // for the other; std::errc::timed_out when it has read nothing for `timeout`.
  [[nodiscard]] std::error_code send(std::string_view frame, std::chrono::milliseconds timeout);

  // Waits up to `timeout` for bytes and takes in all that are there. std::errc::timed_out when none came,
  // std::errc::connection_reset when the daemon is gone, std::errc::bad_message when it sent something else
  // than responses.
  [[nodiscard]] std::error_code receive(std::chrono::milliseconds timeout);

  // What was received and has not been taken out yet.
  std::deque<RpcFrame>& arrived() { return arrived_; }

 private:
  [[nodiscard]] std::error_code takeIn();
  [[nodiscard]] std::error_code decode(std::string_view bytes);

  FileDescriptor socket_;
  RpcStrings texts_;
  RpcFrameReader reader_;
  std::deque<RpcFrame> arrived_;
};

}  // namespace tonewerk
