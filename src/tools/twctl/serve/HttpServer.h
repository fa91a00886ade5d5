// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "tools/twctl/serve/RequestCheck.h"

struct MHD_Daemon;

namespace tonewerk {

// What a request gets.
struct PageAnswer {
  // Returns the next part of the content, and may wait for it. An empty part ends the answer.
  using Parts = std::function<std::string()>;

  unsigned int status = 200;
  std::string type = "text/plain; charset=utf-8";
  std::string policy;                        // Content-Security-Policy
  std::shared_ptr<const std::string> whole;  // the content; null when it comes in parts
  Parts parts;
};

// Answers requests of HTTP/1.1 on the loopback interface, on a thread for each connection.
//
// Bounds: kMostConnections at a time, kMostRequestBytes for the head of a request; its body is not read.
// Of an answer that comes in parts, one part is held for each connection. A connection on which nothing moves
// for kSilence is closed. Each answer has headers that keep pages of other origins from using it.
class HttpServer {
 public:
  static constexpr unsigned int kMostConnections = 32;
  static constexpr std::size_t kMostRequestBytes = std::size_t{32} * 1024;
  static constexpr unsigned int kSilenceSeconds = 30;

  // Runs on the connections' threads, several at a time.
  using Handler = std::function<PageAnswer(const PageRequest& request)>;

  HttpServer() = default;
  HttpServer(const HttpServer&) = delete;
  HttpServer& operator=(const HttpServer&) = delete;
  ~HttpServer();

  // Takes the port, 0 for a free one, without answering yet. Returns the problem, empty on success.
  [[nodiscard]] std::string listen(std::uint16_t port);
  // The port that listen() took.
  std::uint16_t port() const { return port_; }

  // Answers from now on. Returns the problem, empty on success. May be called once, after listen().
  [[nodiscard]] std::string start(Handler handler);
  // Waits for the connections' threads. Parts that are being waited for must come to an end on their own.
  void stop();

 private:
  struct Callbacks;

  FileDescriptor socket_;
  std::uint16_t port_ = 0;
  Handler handler_;
  MHD_Daemon* daemon_ = nullptr;  // null before start() and after stop()
};

}  // namespace tonewerk
