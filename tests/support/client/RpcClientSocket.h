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

// The client's end of the protocol's socket: it sends and receives frames. One thread. After a failure the
// connection can no longer be used, except after std::errc::timed_out of receive().
class RpcClientSocket {
 public:
  RpcClientSocket() : reader_(texts_) {}

  // Waits at most `timeout` while the daemon has a full queue of clients to accept.
  [[nodiscard]] std::error_code connect(const std::string& path, std::chrono::milliseconds timeout);

  int fileDescriptor() const { return socket_.get(); }

  // Writes all of `frame`. While the daemon reads nothing it reads what the daemon sends, so that neither
  // waits for the other. Fails with std::errc::timed_out when the daemon has read nothing for `timeout`.
  [[nodiscard]] std::error_code send(std::string_view frame, std::chrono::milliseconds timeout);

  // Waits up to `timeout` for bytes and reads all that are available. Fails with std::errc::timed_out when
  // none came, std::errc::connection_reset when the daemon is gone, and std::errc::bad_message when it sent
  // something other than responses.
  [[nodiscard]] std::error_code receive(std::chrono::milliseconds timeout);

  // The frames that were received and have not been taken out yet.
  std::deque<RpcFrame>& arrived() { return arrived_; }

 private:
  [[nodiscard]] std::error_code readAvailable();
  [[nodiscard]] std::error_code decode(std::string_view bytes);

  FileDescriptor socket_;
  RpcStrings texts_;
  RpcFrameReader reader_;
  std::deque<RpcFrame> arrived_;
};

}  // namespace tonewerk
