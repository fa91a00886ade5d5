// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/RequestCheck.h"

#include <array>
#include <utility>

#include "tools/twctl/serve/ServeToken.h"

namespace tonewerk {
namespace {

constexpr unsigned int kBadRequest = 400;
constexpr unsigned int kForbidden = 403;
constexpr unsigned int kMethodNotAllowed = 405;
constexpr std::array<std::string_view, 2> kNames{"127.0.0.1:", "localhost:"};
constexpr std::string_view kScheme = "http://";

}  // namespace

RequestCheck::RequestCheck(std::uint16_t port, std::string token)
    : token_(std::move(token)), number_(std::to_string(port)) {}

// A page of another site can give its name the address 127.0.0.1 and so reach this server, but its browser
// then still names that site as the host.
std::optional<Refusal> RequestCheck::problemWith(const PageRequest& request) const {
  if (!request.host || !isOwnHost(*request.host)) {
    return Refusal{kForbidden, "This server answers only as 127.0.0.1:" + number_ + " and localhost:" +
                                   number_ + ". Use the address that twctl serve has printed."};
  }
  if (request.hasOrigin && !(request.origin && request.origin->starts_with(kScheme) &&
                             isOwnHost(request.origin->substr(kScheme.size())))) {
    return Refusal{kForbidden,
                   "Pages of other sites may not ask this server. Open the address that twctl serve has "
                   "printed in a tab of its own."};
  }
  if (request.method != "GET" && request.method != "HEAD") {
    return Refusal{kMethodNotAllowed, "This server only reads. Use GET or HEAD."};
  }
  if (!request.token || !isSameSecret(*request.token, token_)) {
    return Refusal{kForbidden,
                   "The token is missing or wrong. Open the whole address that twctl serve has printed; each "
                   "start of it has a new token."};
  }
  if (request.hasBody) return Refusal{kBadRequest, "A request to read has no content. Send it without one."};
  return std::nullopt;
}

bool RequestCheck::isOwnHost(std::string_view host) const {
  for (const std::string_view name : kNames) {
    if (host.starts_with(name) && host.substr(name.size()) == number_) return true;
  }
  return false;
}

}  // namespace tonewerk
