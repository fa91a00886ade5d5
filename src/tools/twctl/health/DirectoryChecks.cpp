// SPDX-License-Identifier: Apache-2.0
//
// The check of owners and permissions.
#include <cerrno>
#include <cstring>
#include <sys/stat.h>

#include "tools/twctl/health/Checkup.h"
#include "tools/twctl/health/ShellWord.h"
#include "tools/twctl/show/UserName.h"

namespace tonewerk {
namespace {

struct Place {
  std::string path;
  bool mustExist = false;   // while a daemon runs
  bool mayBeRoots = false;  // an administrator's
  bool isDirectory = true;
};

void checkPlace(const Checkup& checkup, const Place& place, Findings& findings) {
  struct stat status {};
  if (stat(place.path.c_str(), &status) != 0) {
    if (errno != ENOENT) return findings.couldNotSee(place.path + ": " + std::strerror(errno));
    if (place.mustExist && checkup.daemon.answers)
      findings.add("missing-directory", place.path + " is missing", checkup.restart());
    return;
  }
  const std::string word = shellWord(place.path);
  const uid_t user = checkup.daemonUser();
  const bool isOwners = status.st_uid == user || (place.mayBeRoots && status.st_uid == 0);
  if (!isOwners) {
    findings.add(
        "foreign-owner",
        place.path + " belongs to " + userName(status.st_uid) + ", and the daemon runs as " + userName(user),
        "sudo chown " + userName(user) + ": " + word);
  }
  if (!place.isDirectory) return;
  if ((status.st_mode & S_IWOTH) != 0 && (status.st_mode & S_ISVTX) == 0)
    findings.add("open-directory", place.path + " can be written by every user", "chmod o-w " + word);
  if (isOwners && status.st_uid == user && (status.st_mode & S_IRWXU) != S_IRWXU)
    findings.add("closed-directory", place.path + " cannot be written by its owner", "chmod u+rwx " + word);
}

}  // namespace

void checkDirectories(const Checkup& checkup, Findings& findings) {
  const Directories& own = checkup.directories;
  for (const Place& place : {
           Place{.path = own.runtime, .mustExist = true},
           Place{.path = own.state, .mustExist = true},
           Place{.path = own.state + "/preferences"},
           Place{.path = own.logs},
           Place{.path = own.configuration, .mayBeRoots = true},
           Place{.path = own.configuration + "/preferences", .mayBeRoots = true},
           Place{.path = checkup.store.path, .isDirectory = false},
       })
    checkPlace(checkup, place, findings);
}

}  // namespace tonewerk
