// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <sys/stat.h>

namespace tonewerk {

// Which file this is, in which state. Two equal stamps of which the first was settled when it was taken mean
// the same contents.
struct FileStamp {
  dev_t device;
  ino_t inode;
  off_t size;
  std::int64_t modifiedNanoseconds;
  std::int64_t changedNanoseconds;

  static FileStamp of(const struct stat& status);
  // Whether a later change is sure to show. File times move in ticks of some milliseconds, and a new file may
  // get the number of one that is gone: so a file that changed just now may change again without a trace in
  // its stamp; after a second it cannot.
  bool isSettled() const;

  friend bool operator==(const FileStamp&, const FileStamp&) = default;
};

}  // namespace tonewerk
