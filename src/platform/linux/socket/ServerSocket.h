// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <sys/types.h>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// Owns the Unix stream socket on which the daemon listens.
class ServerSocket {
 public:
  // Takes the listening socket that systemd passed to this process, if there is one. Otherwise makes a new
  // one at `path`, with mode 0660, makes its directory when that is missing, and replaces the file of a
  // daemon that has died. None when that fails or another process listens there; `problem` then gives the
  // reason and the process. Waits while another process locks the directory, which a starting daemon does for
  // a moment.
  [[nodiscard]] static std::unique_ptr<ServerSocket> open(const std::string& path, std::string& problem);

  ServerSocket(const ServerSocket&) = delete;
  ServerSocket& operator=(const ServerSocket&) = delete;
  // Closes the socket and removes its file. The file stays when systemd made it, when it now belongs to
  // another socket, or when another process has locked the directory; the destructor does not wait for the
  // lock.
  ~ServerSocket();

  // True while its file is where it was made, so that clients find it. The file may have been removed, with
  // its directory or without.
  bool isInPlace() const;
  // Makes a new socket at the path of one whose file was removed. The directory must exist again. Does not
  // wait. Returns none, with the reason in `problem`:
  // - when the system refuses it,
  // - for a socket that systemd passed, because only systemd can make it again,
  // - while another process has locked the directory.
  [[nodiscard]] std::unique_ptr<ServerSocket> recreate(std::string& problem) const;

  // Non-blocking.
  int fileDescriptor() const { return descriptor_.get(); }
  // For log lines.
  const std::string& name() const { return name_; }

 private:
  explicit ServerSocket(FileDescriptor descriptor) : descriptor_(std::move(descriptor)) {}

  [[nodiscard]] static std::unique_ptr<ServerSocket> fromSystemd();
  [[nodiscard]] static std::unique_ptr<ServerSocket> bound(const std::string& path, int lockOperation,
                                                           std::string& problem);
  // Records which file is at `path` now.
  void recordFile(const std::string& path);

  FileDescriptor descriptor_;
  std::string name_;
  bool isSystemds_ = false;
  // The socket's file. The path is empty when it has none.
  std::string path_;
  dev_t device_ = 0;
  ino_t inode_ = 0;
};

}  // namespace tonewerk
