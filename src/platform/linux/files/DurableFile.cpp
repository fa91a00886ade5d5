// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/files/DurableFile.h"

#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/Ownership.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

std::error_code writeSynced(int directory, const std::string& name, std::string_view text) {
  // A crash may have left something under this name, possibly not even a file.
  unlinkat(directory, name.c_str(), 0);
  const FileDescriptor file(
      openat(directory, name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
  if (!file) return lastSystemError();
  if (const std::error_code error = giveToOwnerOf(directory, file.get())) return error;
  if (const std::error_code error = writeAll(file.get(), text)) return error;
  return fsync(file.get()) == 0 ? std::error_code() : lastSystemError();
}

}  // namespace

std::error_code replaceFile(const std::string& directory, const std::string& name, std::string_view text) {
  const FileDescriptor parent(open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!parent) return lastSystemError();
  const std::string newName = name + ".new";
  std::error_code error = writeSynced(parent.get(), newName, text);
  if (!error && renameat(parent.get(), newName.c_str(), parent.get(), name.c_str()) != 0)
    error = lastSystemError();
  if (error) {
    unlinkat(parent.get(), newName.c_str(), 0);
    return error;
  }
  return fsync(parent.get()) == 0 ? std::error_code() : lastSystemError();
}

}  // namespace tonewerk
