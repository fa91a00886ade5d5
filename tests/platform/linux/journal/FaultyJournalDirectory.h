// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "platform/linux/journal/JournalDirectory.h"

namespace tonewerk {

// Which operations of a FaultyJournalDirectory fail, and what a power cut would leave. One thread.
//
//   faults->failing = 7;      // the seventh operation from the start fails
//   faults->count = 2;        // and the eighth
//   faults->writtenPart = 0.5;  // a write that fails has written half of its bytes
class JournalFaults {
 public:
  std::size_t failing = 0;  // from 1; 0 for none
  std::size_t count = 1;
  std::errc error = std::errc::no_space_on_device;
  double writtenPart = 0.0;

  // The operations until now.
  std::size_t operations = 0;

  bool fails() {
    ++operations;
    return failing > 0 && operations >= failing && operations < failing + count;
  }
  std::error_code failure() const { return std::make_error_code(error); }

  struct OnDisk {
    std::uint64_t bytes = 0;
    bool hasName = false;
  };
  // By name.
  std::map<std::string, OnDisk> disk;

  // Leaves in the directory what was synced.
  void losePower(const std::string& path) const {
    std::error_code none;  // there may be no directory
    for (const auto& entry : std::filesystem::directory_iterator(path, none)) {
      const auto found = disk.find(entry.path().filename().string());
      if (found == disk.end() || !found->second.hasName) {
        std::filesystem::remove(entry.path());
      } else {
        std::filesystem::resize_file(entry.path(), found->second.bytes);
      }
    }
  }
};

class FaultyJournalFile final : public JournalFile {
 public:
  FaultyJournalFile(std::shared_ptr<JournalFaults> faults, std::string name,
                    std::shared_ptr<JournalFile> file)
      : faults_(std::move(faults)), name_(std::move(name)), file_(std::move(file)) {}

  [[nodiscard]] std::error_code write(std::uint64_t offset, std::string_view bytes,
                                      std::size_t& written) override {
    const bool fails = faults_->fails();
    const auto part = static_cast<std::size_t>(static_cast<double>(bytes.size()) * faults_->writtenPart);
    const std::error_code error = file_->write(offset, fails ? bytes.substr(0, part) : bytes, written);
    end_ = offset + written;
    return fails ? faults_->failure() : error;
  }
  [[nodiscard]] std::error_code truncate(std::uint64_t bytes) override {
    if (faults_->fails()) return faults_->failure();
    end_ = bytes;
    return file_->truncate(bytes);
  }
  [[nodiscard]] std::error_code sync() override {
    if (faults_->fails()) return faults_->failure();
    faults_->disk[name_].bytes = end_;
    return {};
  }

 private:
  const std::shared_ptr<JournalFaults> faults_;
  const std::string name_;
  const std::shared_ptr<JournalFile> file_;
  std::uint64_t end_ = 0;
};

// A real directory, some of whose operations fail. Its sync() only notes what would be on the disk.
class FaultyJournalDirectory final : public JournalDirectory {
 public:
  FaultyJournalDirectory(std::string path, std::shared_ptr<JournalFaults> faults)
      : faults_(std::move(faults)), directory_(std::move(path)) {}

  const std::string& path() const override { return directory_.path(); }
  [[nodiscard]] std::error_code open() override {
    return faults_->fails() ? faults_->failure() : directory_.open();
  }
  [[nodiscard]] std::error_code list(std::vector<Entry>& entries) const override {
    return faults_->fails() ? faults_->failure() : directory_.list(entries);
  }
  [[nodiscard]] std::error_code read(const std::string& name, std::size_t maxBytes,
                                     std::string& bytes) const override {
    return faults_->fails() ? faults_->failure() : directory_.read(name, maxBytes, bytes);
  }
  [[nodiscard]] std::error_code create(const std::string& name, std::shared_ptr<JournalFile>& file) override {
    if (faults_->fails()) return faults_->failure();
    std::shared_ptr<JournalFile> made;
    if (const std::error_code error = directory_.create(name, made)) return error;
    faults_->disk[name].bytes = 0;
    file = std::make_shared<FaultyJournalFile>(faults_, name, std::move(made));
    return {};
  }
  [[nodiscard]] std::error_code truncate(const std::string& name, std::uint64_t bytes) override {
    if (faults_->fails()) return faults_->failure();
    const auto found = faults_->disk.find(name);
    if (found != faults_->disk.end()) found->second.bytes = std::min(found->second.bytes, bytes);
    return directory_.truncate(name, bytes);
  }
  [[nodiscard]] std::error_code rename(const std::string& from, const std::string& to,
                                       double changedAt) override {
    if (faults_->fails()) return faults_->failure();
    faults_->disk[to] = faults_->disk[from];
    faults_->disk.erase(from);
    return directory_.rename(from, to, changedAt);
  }
  [[nodiscard]] std::error_code remove(const std::string& name) override {
    if (faults_->fails()) return faults_->failure();
    faults_->disk.erase(name);
    return directory_.remove(name);
  }
  [[nodiscard]] std::error_code sync() override {
    if (faults_->fails()) return faults_->failure();
    for (auto& [name, onDisk] : faults_->disk) onDisk.hasName = true;
    return {};
  }

 private:
  const std::shared_ptr<JournalFaults> faults_;
  LinuxJournalDirectory directory_;
};

}  // namespace tonewerk
