// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <filesystem>
#include <grp.h>
#include <string>
#include <sys/prctl.h>
#include <system_error>
#include <unistd.h>

namespace tonewerk {

// Users that need no entry in the system's user database.
inline constexpr std::uint32_t kAlice = 61'001;
inline constexpr std::uint32_t kBob = 61'002;

// Makes the whole process that of another user, for good. Only root can call it. The process still ends
// when its parent ends.
[[nodiscard]] inline std::error_code becomeUser(std::uint32_t user) {
  if (::setgroups(0, nullptr) != 0 || ::setresgid(user, user, user) != 0 ||
      ::setresuid(user, user, user) != 0) {
    return {errno, std::generic_category()};
  }
  // The kernel resets both at a change of user. Sanitizers need the second one for their check at the end.
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  ::prctl(PR_SET_DUMPABLE, 1);
  return {};
}

// Lets every user connect to a socket. Every user may then pass through the directories around it, up to that
// of temporary files.
inline void openToAllUsers(const std::string& socketPath) {
  namespace fs = std::filesystem;
  fs::permissions(socketPath, static_cast<fs::perms>(0666));
  const fs::path end = fs::temp_directory_path();
  for (fs::path at = fs::path(socketPath).parent_path(); at != end && at.has_relative_path();
       at = at.parent_path()) {
    fs::permissions(at, fs::perms::group_exec | fs::perms::others_exec, fs::perm_options::add);
  }
}

}  // namespace tonewerk
