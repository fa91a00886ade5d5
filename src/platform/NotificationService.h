// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string_view>
#include <system_error>

namespace tonewerk {

class SerialQueue;

// Named notifications between the processes of a device: a name has a 64-bit state and can be posted, and
// whoever registered for it is told. Posts that come close together may be told of once.
//
// Any thread.
class NotificationService {
 public:
  using Token = std::int32_t;
  static constexpr Token kNoToken = -1;

  // What a registration came to. 0 is success, everything else a failure; the token is then kNoToken.
  static constexpr std::uint32_t kStatusOk = 0;
  static constexpr std::uint32_t kStatusInvalidName = 1;
  static constexpr std::uint32_t kStatusFailed = 1000000;

  struct Registration {
    std::uint32_t status;
    Token token;
  };

  virtual ~NotificationService() = default;

  // Runs `handler` with the token on `queue` after every post of `name` from now on. A name is a file name:
  // not empty, no slash, not "." or "..", at most 255 bytes. `queue` must outlive the registration.
  [[nodiscard]] virtual Registration registerHandler(std::string_view name, SerialQueue& queue,
                                                     std::function<void(Token)> handler) = 0;

  // The state of the token's name, 0 when nobody has posted it yet; none for a token that is not registered
  // or a state that cannot be read.
  [[nodiscard]] virtual std::optional<std::uint64_t> state(Token token) const = 0;

  // From its return on the handler does not begin, not even for a post that was already queued. On the queue
  // of the registration, or with nothing running there; also from inside the handler. An unknown token does
  // nothing.
  virtual void cancel(Token token) = 0;

  // Posts `name` with the state that it has.
  [[nodiscard]] virtual std::error_code post(std::string_view name) = 0;
};

}  // namespace tonewerk
