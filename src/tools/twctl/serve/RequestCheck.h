// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// What decides whether a request of a browser is answered. The texts are the client's, and may be anything.
struct PageRequest {
  std::string_view method;
  std::string_view path;
  std::optional<std::string_view> token;   // of the address
  std::optional<std::string_view> host;    // none also when the request names several
  std::optional<std::string_view> origin;  // likewise; see hasOrigin
  bool hasOrigin = false;
  bool hasBody = false;
};

// Why a request is not answered: the status of HTTP, and a sentence for people that says what to do.
struct Refusal {
  unsigned int status;
  std::string sentence;
};

// Decides which requests get an answer: those for this server by its own names, from no page of another
// origin, that only read, and that know the token. Any thread.
class RequestCheck {
 public:
  // The server listens on `port` of the loopback interface.
  RequestCheck(std::uint16_t port, std::string token);

  // None for a request that may be answered.
  [[nodiscard]] std::optional<Refusal> problemWith(const PageRequest& request) const;

 private:
  [[nodiscard]] bool isOwnHost(std::string_view host) const;

  const std::string token_;
  const std::string number_;
};

}  // namespace tonewerk
