// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/notifications/NotificationFiles.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/NotificationHandlers.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/files/Ownership.h"
#include "platform/linux/files/TextFile.h"

namespace tonewerk {
namespace {

constexpr mode_t kFileMode = 0644;
constexpr unsigned kDirectoryMode = 0755;

// Other users may put anything at a file's path: a pipe must not block us, and a link must not be followed.
constexpr int kCareful = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;

// Fails if `path` is not a regular file.
FileDescriptor openRegularFile(const std::string& path, int flags, std::error_code& error) {
  FileDescriptor file(open(path.c_str(), flags | kCareful));
  struct stat status {};
  if (!file || fstat(file.get(), &status) != 0) {
    error = lastSystemError();
    return {};
  }
  if (S_ISREG(status.st_mode)) return file;
  error = std::make_error_code(std::errc::invalid_argument);
  return {};
}

// Looks at a link itself. False when there is nothing at the path.
bool belongsToAnother(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0 && status.st_uid != geteuid();
}

std::optional<std::uint64_t> parseState(std::string_view text) {
  constexpr std::string_view kSpaces = " \t\r\n";
  text.remove_prefix(std::min(text.find_first_not_of(kSpaces), text.size()));
  std::uint64_t state = 0;
  const char* const end = text.data() + text.size();
  const auto parsed = std::from_chars(text.data(), end, state);
  if (parsed.ec != std::errc()) return std::nullopt;
  const std::string_view rest(parsed.ptr, static_cast<std::size_t>(end - parsed.ptr));
  return rest.find_first_not_of(kSpaces) == std::string_view::npos ? std::optional(state) : std::nullopt;
}

// Reads at most as many bytes as fit into `buffer`.
std::string_view readInto(std::array<char, NotificationFiles::kMaxStateBytes + 1>& buffer, int file,
                          std::error_code& error) {
  std::size_t size = 0;
  while (size < buffer.size()) {
    const ssize_t count = read(file, buffer.data() + size, buffer.size() - size);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) error = lastSystemError();
    if (count <= 0) break;
    size += static_cast<std::size_t>(count);
  }
  return {buffer.data(), size};
}

// A file name that no other writer uses.
std::string temporaryName() {
  static std::atomic<unsigned> count = 0;
  return ".new-" + std::to_string(getpid()) + "-" + std::to_string(++count);
}

std::error_code writeNewFile(const std::string& directory, const std::string& path, std::string_view text) {
  const FileDescriptor parent(open(directory.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  const FileDescriptor file(open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | kCareful, kFileMode));
  if (!parent || !file) return lastSystemError();
  // The daemon must be able to open the file for writing, because it posts, too.
  if (const std::error_code error = giveToOwnerOf(parent.get(), file.get())) return error;
  const ssize_t written = write(file.get(), text.data(), text.size());
  if (written < 0) return lastSystemError();
  // A short write of so few bytes means that the disk is full.
  return written == static_cast<ssize_t>(text.size()) ? std::error_code()
                                                      : std::make_error_code(std::errc::no_space_on_device);
}

}  // namespace

std::string NotificationFiles::pathOf(std::string_view name) const {
  return directory_ + "/" + std::string(name);
}

std::optional<std::uint64_t> NotificationFiles::state(std::string_view name, std::error_code& error) const {
  error.clear();
  if (!NotificationHandlers::isName(name)) {
    error = std::make_error_code(std::errc::invalid_argument);
    return std::nullopt;
  }
  const FileDescriptor file = openRegularFile(pathOf(name), O_RDONLY, error);
  if (!file) return std::nullopt;
  std::array<char, kMaxStateBytes + 1> buffer{};
  const std::string_view text = readInto(buffer, file.get(), error);
  if (error) return std::nullopt;
  const std::optional<std::uint64_t> state = text.size() > kMaxStateBytes ? std::nullopt : parseState(text);
  if (!state) error = std::make_error_code(std::errc::result_out_of_range);
  return state;
}

template <typename Place>
std::error_code NotificationFiles::put(std::uint64_t state, Place place) const {
  std::error_code error = LinuxFileSystem().createDirectories(directory_, kDirectoryMode);
  if (error) return error;
  const std::string path = pathOf(temporaryName());
  // A crash may have left a file with this name.
  unlink(path.c_str());
  error = writeNewFile(directory_, path, std::to_string(state) + "\n");
  if (!error && place(path.c_str()) != 0) error = lastSystemError();
  unlink(path.c_str());
  return error;
}

std::error_code NotificationFiles::post(std::string_view name) const {
  if (!NotificationHandlers::isName(name)) return std::make_error_code(std::errc::invalid_argument);
  const std::string path = pathOf(name);
  std::error_code error;
  // Closing a file that was opened for writing is a post. It keeps a state that another writer sets
  // meanwhile.
  if (openRegularFile(path, O_WRONLY, error)) return {};
  if (error == std::errc::permission_denied || belongsToAnother(path)) return takeOver(name);
  if (error != std::errc::no_such_file_or_directory) return error;
  error = put(0, [&](const char* made) { return link(made, path.c_str()); });
  // Another process created the file meanwhile. That was a post of the same name.
  return error == std::errc::file_exists ? std::error_code() : error;
}

// A state that another writer sets meanwhile is lost, as if it had been set before. The other user may have
// left a file without rights for us, a pipe or a link, which must not keep the name from the directory's
// owner. So only the directory's rights decide, when the file is replaced.
std::error_code NotificationFiles::takeOver(std::string_view name) const {
  std::error_code error;
  const std::optional<std::uint64_t> kept = state(name, error);
  error = post(name, kept.value_or(0));
  return error == std::errc::operation_not_permitted ? std::make_error_code(std::errc::permission_denied)
                                                     : error;
}

std::error_code NotificationFiles::post(std::string_view name, std::uint64_t state) const {
  if (!NotificationHandlers::isName(name)) return std::make_error_code(std::errc::invalid_argument);
  return put(state, [&](const char* made) { return std::rename(made, pathOf(name).c_str()); });
}

}  // namespace tonewerk
