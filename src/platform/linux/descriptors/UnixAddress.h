// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <sys/socket.h>
#include <sys/un.h>

namespace tonewerk {

// The address of a Unix socket in the file system. None when the path is empty or too long for an address.
[[nodiscard]] inline std::optional<sockaddr_un> unixAddressOf(const std::string& path) {
  sockaddr_un address{};
  if (path.empty() || path.size() >= sizeof(address.sun_path)) return std::nullopt;
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, path.size());
  return address;
}

inline const sockaddr* generic(const sockaddr_un& address) {
  return reinterpret_cast<const sockaddr*>(&address);
}

}  // namespace tonewerk
