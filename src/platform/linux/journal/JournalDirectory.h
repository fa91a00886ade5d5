// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "platform/linux/descriptors/FileDescriptor.h"

namespace tonewerk {

// A new file of the journal, while records are added to it.
class JournalFile {
 public:
  virtual ~JournalFile() = default;

  // Writes all bytes, in as many calls as necessary. After a failure, `written` of them are in the file.
  [[nodiscard]] virtual std::error_code write(std::uint64_t offset, std::string_view bytes,
                                              std::size_t& written) = 0;
  [[nodiscard]] virtual std::error_code truncate(std::uint64_t bytes) = 0;
  // Brings what is written to the disk; after a failure, all since the last success. One thread at a time,
  // also during a write.
  [[nodiscard]] virtual std::error_code sync() = 0;
};

// The files of the journal, by their names in one directory. One thread uses it at a time.
class JournalDirectory {
 public:
  struct Entry {
    std::string name;
    std::uint64_t bytes = 0;
    double changedAt = 0.0;  // seconds since 1970
  };

  virtual ~JournalDirectory() = default;

  // The directory's path, for people.
  virtual const std::string& path() const = 0;

  // Makes the directory when it is missing, and claims it. Fails with std::errc::device_or_resource_busy when
  // another process has claimed it. May be called again, also after a success.
  [[nodiscard]] virtual std::error_code open() = 0;
  // The functions below fail before open().

  // Adds the regular files, in no order.
  [[nodiscard]] virtual std::error_code list(std::vector<Entry>& entries) const = 0;
  // Reads the first bytes, at most `maxBytes`. What the disk cannot read is zeros.
  [[nodiscard]] virtual std::error_code read(const std::string& name, std::size_t maxBytes,
                                             std::string& bytes) const = 0;
  // Makes an empty file, in place of one that is there.
  [[nodiscard]] virtual std::error_code create(const std::string& name,
                                               std::shared_ptr<JournalFile>& file) = 0;
  [[nodiscard]] virtual std::error_code truncate(const std::string& name, std::uint64_t bytes) = 0;
  // Renames the file and sets its time.
  [[nodiscard]] virtual std::error_code rename(const std::string& from, const std::string& to,
                                               double changedAt) = 0;
  [[nodiscard]] virtual std::error_code remove(const std::string& name) = 0;
  // Brings the names to the disk. Any thread, also while other functions run, but not during open().
  [[nodiscard]] virtual std::error_code sync() = 0;
};

// A directory of Linux. Only its owner may read it and its files. The claim ends with this object, or with
// the process.
class LinuxJournalDirectory final : public JournalDirectory {
 public:
  explicit LinuxJournalDirectory(std::string path) : path_(std::move(path)) {}

  const std::string& path() const override { return path_; }
  [[nodiscard]] std::error_code open() override;
  // Instead of open(): opens the directory that is there, which another process may be using, without a claim
  // and without a change. Only list() and read() may follow.
  [[nodiscard]] std::error_code openToRead();
  [[nodiscard]] std::error_code list(std::vector<Entry>& entries) const override;
  [[nodiscard]] std::error_code read(const std::string& name, std::size_t maxBytes,
                                     std::string& bytes) const override;
  [[nodiscard]] std::error_code create(const std::string& name, std::shared_ptr<JournalFile>& file) override;
  [[nodiscard]] std::error_code truncate(const std::string& name, std::uint64_t bytes) override;
  [[nodiscard]] std::error_code rename(const std::string& from, const std::string& to,
                                       double changedAt) override;
  [[nodiscard]] std::error_code remove(const std::string& name) override;
  [[nodiscard]] std::error_code sync() override;

 private:
  const std::string path_;
  FileDescriptor directory_;
};

}  // namespace tonewerk
