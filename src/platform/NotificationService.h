// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string_view>
#include <system_error>

namespace tonewerk {

class SerialQueue;

// Exchanges named notifications between the processes of a device. A name has a 64-bit state and can be
// posted; a post runs the handlers that are registered for the name. Several posts in a short time may run a
// handler once.
//
// Any thread.
class NotificationService {
 public:
  using Token = std::int32_t;
  static constexpr Token kNoToken = -1;

  // The status of a registration. 0 is success, everything else a failure; the token is then kNoToken.
  static constexpr std::uint32_t kStatusOk = 0;
  static constexpr std::uint32_t kStatusInvalidName = 1;
  static constexpr std::uint32_t kStatusFailed = 1000000;

  struct Registration {
    std::uint32_t status;
    Token token;
  };

  virtual ~NotificationService() = default;

  // Runs `handler` with the token on `queue` after every later post of `name`. A name is a file name: not
  // empty, no slash, no ASCII control character, not "." or "..", at most 255 bytes. `queue` must outlive the
  // registration.
  [[nodiscard]] virtual Registration registerHandler(std::string_view name, SerialQueue& queue,
                                                     std::function<void(Token)> handler) = 0;

  // Returns the state of the token's name, 0 when nobody has posted it yet. Returns none for a token that is
  // not registered, and when the state cannot be read.
  [[nodiscard]] virtual std::optional<std::uint64_t> state(Token token) const = 0;

  // After it returns the handler does not begin any more, not even for a post that was already queued. Call
  // it on the registration's queue, also from inside the handler, or while nothing runs there. Does nothing
  // for an unknown token.
  virtual void cancel(Token token) = 0;

  // Posts `name` without changing its state.
  [[nodiscard]] virtual std::error_code post(std::string_view name) = 0;
};

}  // namespace tonewerk
