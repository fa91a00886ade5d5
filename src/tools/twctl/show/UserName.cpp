// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/UserName.h"

#include <array>
#include <pwd.h>

#include "protocol/RequestSet.h"
#include "values/PrintableText.h"

namespace tonewerk {

std::string userName(std::uint64_t user) {
  if (user == kNoUser) return "(unknown)";
  std::array<char, 4096> texts{};
  passwd entry{};
  passwd* found = nullptr;
  const int failure = ::getpwuid_r(static_cast<uid_t>(user), &entry, texts.data(), texts.size(), &found);
  return failure != 0 || found == nullptr ? std::to_string(user) : printable(found->pw_name);
}

}  // namespace tonewerk
