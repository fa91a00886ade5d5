// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <sys/types.h>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// The Unix stream socket on which the daemon listens.
class ServerSocket {
 public:
  // The listening socket that systemd passed to this process, where there is one; else a new one at `path`
  // (mode 0660, its directory made when missing), where the file that a dead daemon left is replaced. None
  // when that fails or another process listens there; `problem` then says why, and who. Waits for a process
  // that has locked the directory, as daemons that start do for a moment.
  [[nodiscard]] static std::unique_ptr<ServerSocket> open(const std::string& path, std::string& problem);

  ServerSocket(const ServerSocket&) = delete;
  ServerSocket& operator=(const ServerSocket&) = delete;
  // Closes the socket, and removes its file unless that is systemd's or by now somebody else's, or another
  // process has locked the directory, which is not waited for.
  ~ServerSocket();

  // Whether clients still find it where it was made: its file may have gone, with its directory or without.
  bool isInPlace() const;
  // A new one in the place of one that went. Its directory must be there again. None, with `problem` saying
  // why, also for a socket that systemd passed, which only systemd can make again, and while another process
  // has locked the directory: nothing is waited for.
  [[nodiscard]] std::unique_ptr<ServerSocket> madeAgain(std::string& problem) const;

  // Non-blocking.
  int fileDescriptor() const { return descriptor_.get(); }
  // For log lines.
  const std::string& name() const { return name_; }

 private:
  explicit ServerSocket(FileDescriptor descriptor) : descriptor_(std::move(descriptor)) {}

  [[nodiscard]] static std::unique_ptr<ServerSocket> fromSystemd();
  [[nodiscard]] static std::unique_ptr<ServerSocket> bound(const std::string& path, int lockOperation,
                                                           std::string& problem);
  // Notes what the socket's file is now.
  void noteFile(const std::string& path);

  FileDescriptor descriptor_;
  std::string name_;
  bool isSystemds_ = false;
  // The socket's file; no path when it has none.
  std::string path_;
  dev_t device_ = 0;
  ino_t inode_ = 0;
};

}  // namespace tonewerk
