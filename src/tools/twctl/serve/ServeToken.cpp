// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/serve/ServeToken.h"

#include <array>
#include <cstddef>
#include <sys/random.h>

namespace tonewerk {

std::optional<std::string> newServeToken() {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::array<unsigned char, 20> bytes{};
  // Up to 256 bytes come at once, or not at all.
  if (getrandom(bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) return std::nullopt;
  std::string token;
  for (const unsigned char byte : bytes) {
    token += kDigits[byte / kDigits.size()];
    token += kDigits[byte % kDigits.size()];
  }
  return token;
}

bool isSameSecret(std::string_view given, std::string_view secret) {
  if (secret.empty()) return false;
  unsigned int difference = given.size() == secret.size() ? 0 : 1;
  for (std::size_t i = 0; i < given.size(); ++i) {
    const auto a = static_cast<unsigned char>(given[i]);
    const auto b = static_cast<unsigned char>(secret[i % secret.size()]);
    difference |= static_cast<unsigned int>(a ^ b);
  }
  return difference == 0;
}

}  // namespace tonewerk
