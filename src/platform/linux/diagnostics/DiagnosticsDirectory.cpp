// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/diagnostics/DiagnosticsDirectory.h"

#include <algorithm>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <tuple>
#include <unistd.h>
#include <utility>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

namespace fs = std::filesystem;

// Other users must not read log lines and process tables.
constexpr mode_t kDirectoryMode = 0750;
constexpr mode_t kFileMode = 0640;
constexpr std::uint64_t kBlockBytes = 4096;
constexpr std::int64_t kNanoseconds = 1'000'000'000;

std::uint64_t inBlocks(std::uint64_t bytes) { return (bytes + kBlockBytes - 1) / kBlockBytes * kBlockBytes; }

bool isPlainCharacter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '-' || c == '_' ||
         c == '+' || c == '.';
}

// Does not follow a link.
bool isDirectory(const std::string& path, struct stat& status) {
  return lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// The sorted names in a directory; none if it cannot be read.
std::vector<std::string> namesIn(const std::string& directory) {
  std::vector<std::string> names;
  std::error_code error;
  for (fs::directory_iterator at(directory, error), end; !error && at != end; at.increment(error)) {
    names.push_back(at->path().filename().string());
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::error_code makeDirectory(const std::string& path) {
  return mkdir(path.c_str(), kDirectoryMode) == 0 ? std::error_code() : lastSystemError();
}

std::error_code syncDirectory(const std::string& path) {
  const FileDescriptor directory(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return directory && fsync(directory.get()) == 0 ? std::error_code() : lastSystemError();
}

std::error_code writeFile(const std::string& path, std::string_view text) {
  const FileDescriptor file(
      open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kFileMode));
  if (!file) return lastSystemError();
  if (const std::error_code error = writeAll(file.get(), text)) return error;
  return fsync(file.get()) == 0 ? std::error_code() : lastSystemError();
}

std::error_code fill(const std::string& path, const std::vector<DiagnosticFile>& files) {
  if (const std::error_code error = makeDirectory(path)) return error;
  for (const DiagnosticFile& file : files) {
    if (const std::error_code error = writeFile(path + "/" + file.name, file.text)) return error;
  }
  return syncDirectory(path);
}

void removeTree(const std::string& path) {
  std::error_code ignored;  // sweep() removes leftovers at the next start
  fs::remove_all(path, ignored);
}

bool isOlder(const DiagnosticsDirectory::Entry& a, const DiagnosticsDirectory::Entry& b) {
  return std::tie(a.modifiedNanoseconds, a.name) < std::tie(b.modifiedNanoseconds, b.name);
}

}  // namespace

DiagnosticsDirectory::DiagnosticsDirectory(std::string stateDirectory)
    : stateDirectory_(std::move(stateDirectory)) {}

bool DiagnosticsDirectory::isPlainName(std::string_view name) {
  return !name.empty() && name.size() <= kMaxNameBytes && name.front() != '.' && name.front() != '-' &&
         std::all_of(name.begin(), name.end(), isPlainCharacter);
}

std::uint64_t DiagnosticsDirectory::bytesOnDisk(const std::vector<DiagnosticFile>& files) {
  std::uint64_t bytes = kBlockBytes;  // the folder's
  for (const DiagnosticFile& file : files) bytes += inBlocks(file.text.size());
  return bytes;
}

std::string DiagnosticsDirectory::directoryOf(DiagnosticKind kind) const {
  return stateDirectory_ + "/" + std::string(directoryNameOf(kind));
}

std::string DiagnosticsDirectory::pathOf(DiagnosticKind kind, std::string_view name) const {
  return directoryOf(kind) + "/" + std::string(name);
}

std::error_code DiagnosticsDirectory::checkReadable(DiagnosticKind kind) const {
  std::error_code error;
  const fs::directory_iterator opened(directoryOf(kind), error);
  return error == std::errc::no_such_file_or_directory ? std::error_code() : error;
}

std::vector<DiagnosticsDirectory::Entry> DiagnosticsDirectory::list(DiagnosticKind kind) const {
  std::vector<Entry> entries;
  for (std::string& name : namesIn(directoryOf(kind))) {
    struct stat status {};
    if (!isPlainName(name) || !isDirectory(pathOf(kind, name), status)) continue;
    Entry entry{kind, std::move(name), 0, kBlockBytes};
    entry.modifiedNanoseconds = status.st_mtim.tv_sec * kNanoseconds + status.st_mtim.tv_nsec;
    for (const FileEntry& file : filesOf(kind, entry.name)) entry.bytes += inBlocks(file.bytes);
    entries.push_back(std::move(entry));
  }
  std::sort(entries.begin(), entries.end(), isOlder);
  return entries;
}

std::vector<DiagnosticsDirectory::Entry> DiagnosticsDirectory::listAll() const {
  std::vector<Entry> all;
  for (const DiagnosticKind kind : kDiagnosticKinds) {
    for (Entry& entry : list(kind)) all.push_back(std::move(entry));
  }
  std::sort(all.begin(), all.end(), isOlder);
  return all;
}

bool DiagnosticsDirectory::contains(DiagnosticKind kind, std::string_view name) const {
  struct stat status {};
  return isPlainName(name) && isDirectory(pathOf(kind, name), status);
}

std::vector<DiagnosticsDirectory::FileEntry> DiagnosticsDirectory::filesOf(DiagnosticKind kind,
                                                                           std::string_view name) const {
  std::vector<FileEntry> files;
  if (!contains(kind, name)) return files;
  const std::string path = pathOf(kind, name) + "/";
  for (std::string& file : namesIn(path)) {
    struct stat status {};
    if (lstat((path + file).c_str(), &status) != 0 || !S_ISREG(status.st_mode)) continue;
    files.push_back({std::move(file), static_cast<std::uint64_t>(status.st_size)});
  }
  return files;
}

std::optional<std::string> DiagnosticsDirectory::readFile(DiagnosticKind kind, std::string_view item,
                                                          std::string_view file) const {
  if (!isPlainName(file) || !contains(kind, item)) return std::nullopt;
  const std::string path = pathOf(kind, item) + "/" + std::string(file);
  struct stat status {};
  std::string text;
  if (lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
  if (readTextFile(path, text)) return std::nullopt;
  return text;
}

std::error_code DiagnosticsDirectory::write(DiagnosticKind kind, const std::string& name,
                                            const std::vector<DiagnosticFile>& files) const {
  const auto isPlainFile = [](const DiagnosticFile& file) { return isPlainName(file.name); };
  if (!isPlainName(name) || !std::all_of(files.begin(), files.end(), isPlainFile)) {
    return std::make_error_code(std::errc::invalid_argument);
  }
  const std::string directory = directoryOf(kind);
  std::error_code error;
  fs::create_directories(stateDirectory_, error);
  if (error) return error;
  error = makeDirectory(directory);
  if (error && error != std::errc::file_exists) return error;
  const std::string path = pathOf(kind, name);
  const std::string newPath = pathOf(kind, "." + name + ".new");
  removeTree(newPath);
  error = fill(newPath, files);
  // rename() would replace an empty folder.
  if (!error && contains(kind, name)) error = std::make_error_code(std::errc::file_exists);
  if (!error && std::rename(newPath.c_str(), path.c_str()) != 0) error = lastSystemError();
  if (error) {
    removeTree(newPath);
    return error;
  }
  return syncDirectory(directory);
}

std::error_code DiagnosticsDirectory::remove(DiagnosticKind kind, const std::string& name) const {
  if (!contains(kind, name)) return std::make_error_code(std::errc::no_such_file_or_directory);
  const std::string oldPath = pathOf(kind, "." + name + ".old");
  removeTree(oldPath);
  if (std::rename(pathOf(kind, name).c_str(), oldPath.c_str()) != 0) return lastSystemError();
  std::error_code error;
  fs::remove_all(oldPath, error);
  return error;
}

std::size_t DiagnosticsDirectory::sweep() const {
  std::size_t count = 0;
  for (const DiagnosticKind kind : kDiagnosticKinds) {
    for (const std::string& name : namesIn(directoryOf(kind))) {
      if (name.front() != '.') continue;
      removeTree(pathOf(kind, name));
      ++count;
    }
  }
  return count;
}

}  // namespace tonewerk
