// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <sys/stat.h>

namespace tonewerk {

// Identifies a file and its state. Two equal stamps mean the same contents if the first was settled when it
// was taken.
struct FileStamp {
  dev_t device;
  ino_t inode;
  off_t size;
  std::int64_t modifiedNanoseconds;
  std::int64_t changedNanoseconds;
  uid_t owner;  // a change of the owner also changes the status, and so the time above

  static FileStamp of(const struct stat& status);
  // Whether any later change will change the stamp. File times advance in ticks of some milliseconds, and a
  // new file may get the inode number of a removed one. So a file may change twice within a tick and keep its
  // stamp. A second after the last change that is no longer possible.
  bool isSettled() const;

  friend bool operator==(const FileStamp&, const FileStamp&) = default;
};

}  // namespace tonewerk
