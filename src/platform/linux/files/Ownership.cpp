// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/Ownership.h"

#include <sys/stat.h>
#include <unistd.h>

#include "platform/linux/files/TextFile.h"

namespace tonewerk {

std::error_code giveToOwnerOf(int directory, int made) {
  if (geteuid() != 0) return {};
  struct stat wanted {};
  struct stat found {};
  if (fstat(directory, &wanted) != 0 || fstat(made, &found) != 0) return lastSystemError();
  if (wanted.st_uid == found.st_uid && wanted.st_gid == found.st_gid) return {};
  return fchown(made, wanted.st_uid, wanted.st_gid) == 0 ? std::error_code() : lastSystemError();
}

}  // namespace tonewerk
