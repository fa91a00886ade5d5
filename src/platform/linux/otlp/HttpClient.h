// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace tonewerk {

struct HttpRequest {
  std::string url;
  std::vector<std::string> headers;  // "Name: value"
  std::string body;
};

struct HttpAnswer {
  // What a body is read up to; the rest is not waited for.
  static constexpr std::size_t kMaxBodyBytes = std::size_t{64} << 10;

  int status = 0;          // 0 when there was none
  std::string problem;     // why there was none, or why the body is not whole; else empty
  std::string retryAfter;  // the header's value, empty without it
  std::string body;
};

// Posts to HTTP servers that may be down, slow or hostile.
class HttpClient {
 public:
  virtual ~HttpClient() = default;

  // One thread at a time. Waits for the answer, within the client's time-outs. Never follows a redirection.
  [[nodiscard]] virtual HttpAnswer post(const HttpRequest& request) = 0;

  // Any thread. Ends a post() that is running; it and those that follow have no answer.
  virtual void cancel() = 0;
};

}  // namespace tonewerk
