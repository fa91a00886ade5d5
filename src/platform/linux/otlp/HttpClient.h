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
  // A body is read up to this size; then the transfer ends.
  static constexpr std::size_t kMaxBodyBytes = std::size_t{64} << 10;

  int status = 0;          // 0 without an answer
  std::string problem;     // why there is no answer, or why the body is incomplete; otherwise empty
  std::string retryAfter;  // the header's value, empty without it
  std::string body;
};

// Posts requests to HTTP servers, which may be down, slow or hostile.
class HttpClient {
 public:
  virtual ~HttpClient() = default;

  // One thread at a time. Waits for the answer, within the client's time-outs. Never follows a redirection.
  [[nodiscard]] virtual HttpAnswer post(const HttpRequest& request) = 0;

  // Any thread. Ends a running post(). That call and all later ones return without an answer.
  virtual void cancel() = 0;
};

}  // namespace tonewerk
