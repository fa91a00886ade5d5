// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/preferences/TomlPreferenceStore.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <sys/file.h>
#include <utility>

#include "platform/PreferenceSchema.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/files/DurableFile.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/files/Ownership.h"
#include "platform/linux/files/TextFile.h"
#include "platform/linux/preferences/TomlText.h"

namespace tonewerk {
namespace {

constexpr std::string_view kEnding = ".toml";
constexpr std::size_t kMaxDomainBytes = 200;
constexpr unsigned kDirectoryMode = 0755;

bool isDomain(std::string_view domain) {
  return !domain.empty() && domain.size() <= kMaxDomainBytes && domain.front() != '.' &&
         domain.find('/') == std::string_view::npos && domain.find('\0') == std::string_view::npos;
}

std::string fileNameOf(std::string_view domain) { return std::string(domain) + std::string(kEnding); }

// Also compares the types: for == the values 1, 1.0 and true are equal. A value is left out of the written
// file only if the configuration has the same value of the same type.
bool isSame(const Value& a, const Value& b) {
  if (a.kind() != b.kind()) return false;
  if (const ValueArray* array = a.asArray()) {
    return std::equal(array->begin(), array->end(), b.asArray()->begin(), b.asArray()->end(), isSame);
  }
  const ValueMap* map = a.asMap();
  if (map == nullptr) return a == b;
  return map->size() == b.asMap()->size() &&
         std::all_of(map->begin(), map->end(), [&](const ValueMap::Entry& entry) {
           const Value* other = b.asMap()->find(entry.key);
           return other != nullptr && isSame(entry.value, *other);
         });
}

// The value as it will be read back; none if TOML cannot express it.
std::optional<Value> asStored(const Value& value, std::string& problem) {
  const std::optional<std::string> text = tomlText(ValueMap{{"value", value}}, problem);
  const std::optional<ValueMap> stored = text ? parseToml(*text, problem) : std::nullopt;
  if (!stored) return std::nullopt;
  return *stored->find("value");
}

void removeConfiguredValues(ValueMap& written, const ValueMap& configured) {
  for (const ValueMap::Entry& entry : configured) {
    const Value* own = written.find(entry.key);
    if (own != nullptr && isSame(*own, entry.value)) written.erase(entry.key);
  }
}

// Opens the lock file. Creates it if it does not exist.
FileDescriptor openLock(const std::string& directory, std::error_code& error) {
  constexpr const char* kName = ".lock";
  constexpr int kFlags = O_RDWR | O_NOFOLLOW | O_CLOEXEC;
  const FileDescriptor parent(open(directory.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  FileDescriptor made(openat(parent.get(), kName, kFlags | O_CREAT | O_EXCL, 0600));
  if (made) {
    error = giveToOwnerOf(parent.get(), made.get());
    return made;
  }
  return FileDescriptor(openat(parent.get(), kName, kFlags));
}

// Locks out all other writers in this and other processes. Closing the file releases the lock.
FileDescriptor lockWriters(const std::string& directory, std::error_code& error) {
  FileDescriptor lock = openLock(directory, error);
  if (error) return {};
  int locked = -1;
  if (lock) {
    do {
      locked = flock(lock.get(), LOCK_EX);
    } while (locked != 0 && errno == EINTR);
  }
  if (locked != 0) error = lastSystemError();
  return lock;
}

}  // namespace

TomlPreferenceStore::TomlPreferenceStore(std::string configurationDirectory, std::string stateDirectory,
                                         const LogCategory& log)
    : configurationDirectory_(std::move(configurationDirectory)),
      stateDirectory_(std::move(stateDirectory)),
      log_(log) {}

TomlPreferenceStore::Domain& TomlPreferenceStore::refreshed(std::string_view domain) const {
  auto found = domains_.find(domain);
  if (found == domains_.end()) {
    const std::string file = "/" + fileNameOf(domain);
    found = domains_
                .emplace(domain, Domain{TomlFile(configurationDirectory_ + file, log_),
                                        TomlFile(stateDirectory_ + file, log_)})
                .first;
  }
  Domain& held = found->second;
  held.configured.refresh();
  held.written.refresh();
  return held;
}

TomlPreferenceStore::Contents TomlPreferenceStore::contentsOf(std::string_view domain) const {
  if (!isDomain(domain)) return {};
  const MutexLock lock(mutex_);
  const Domain& held = refreshed(domain);
  return {held.configured.values(), held.written.values(), held.written.problem()};
}

void TomlPreferenceStore::checkFile(std::string_view fileName) const {
  if (!fileName.ends_with(kEnding)) return;
  const std::string_view domain = fileName.substr(0, fileName.size() - kEnding.size());
  const Contents contents = contentsOf(domain);
  ValueMap set = contents.configured;
  set.merge(contents.written);
  logUnknownKeys(domain, unknownKeys(domain, set));
}

void TomlPreferenceStore::logUnknownKeys(std::string_view domain,
                                         const std::vector<std::string>& lines) const {
  {
    const MutexLock lock(mutex_);
    if (std::exchange(loggedUnknown_[std::string(domain)], lines) == lines) return;
  }
  for (const std::string& line : lines) errorLog(log_, "%@", line);
}

void TomlPreferenceStore::checkAllFiles() const {
  for (const std::string& directory : {configurationDirectory_, stateDirectory_}) {
    std::error_code error;  // the directory need not exist
    std::filesystem::directory_iterator entry(directory, error);
    for (const std::filesystem::directory_iterator end; !error && entry != end; entry.increment(error)) {
      checkFile(entry->path().filename().string());
    }
  }
}

TomlPreferenceStore::Layers TomlPreferenceStore::readLayers(std::string_view domain) const {
  Contents contents = contentsOf(domain);
  return {std::move(contents.configured), std::move(contents.written)};
}

std::optional<Value> TomlPreferenceStore::read(std::string_view domain, std::string_view key) const {
  if (!isDomain(domain)) return std::nullopt;
  const MutexLock lock(mutex_);
  const Domain& held = refreshed(domain);
  const Value* value = held.written.values().find(key);
  if (value == nullptr) value = held.configured.values().find(key);
  return value == nullptr ? std::nullopt : std::optional(*value);
}

ValueMap TomlPreferenceStore::readAll(std::string_view domain) const {
  Contents contents = contentsOf(domain);
  contents.configured.merge(contents.written);
  return contents.configured;
}

std::error_code TomlPreferenceStore::write(std::string_view domain, std::string_view key, const Value& value,
                                           std::string* problem) {
  std::string words;
  const std::optional<Value> stored = asStored(value, words);
  if (!stored) {
    if (problem != nullptr) *problem = words;
    return std::make_error_code(std::errc::result_out_of_range);
  }
  return update(domain, problem, [&](Contents& contents, std::string&) {
    contents.written.set(key, *stored);
    return std::error_code();
  });
}

std::error_code TomlPreferenceStore::remove(std::string_view domain, std::string_view key,
                                            std::string* problem) {
  return update(domain, problem, [&](Contents& contents, std::string& words) {
    if (contents.written.erase(key)) return std::error_code();
    const bool isConfigured = contents.configured.contains(key);
    words = std::string(key) + (isConfigured ? " is set by the configuration alone" : " is not set");
    return std::make_error_code(isConfigured ? std::errc::operation_not_permitted
                                             : std::errc::no_such_file_or_directory);
  });
}

template <typename Change>
std::error_code TomlPreferenceStore::update(std::string_view domain, std::string* problem, Change change) {
  std::string words;
  const auto outcome = [&]() -> std::error_code {
    if (!isDomain(domain)) {
      words = "\"" + std::string(domain) + "\" cannot name a preference domain";
      return std::make_error_code(std::errc::invalid_argument);
    }
    if (const std::error_code error = LinuxFileSystem().createDirectories(stateDirectory_, kDirectoryMode)) {
      words = stateDirectory_ + ": " + error.message();
      return error;
    }
    std::error_code error;
    const FileDescriptor lock = lockWriters(stateDirectory_, error);
    if (error) {
      words = stateDirectory_ + "/.lock: " + error.message();
      return error;
    }
    Contents contents = contentsOf(domain);
    if (!contents.problem.empty()) {
      words = contents.problem + "; mend or remove the file first";
      return std::make_error_code(std::errc::invalid_argument);
    }
    error = change(contents, words);
    return error ? error : store(domain, contents, words);
  };
  const std::error_code error = outcome();
  if (error && problem != nullptr) *problem = words;
  return error;
}

std::error_code TomlPreferenceStore::store(std::string_view domain, const Contents& contents,
                                           std::string& problem) const {
  ValueMap differing = contents.written;
  removeConfiguredValues(differing, contents.configured);
  const std::optional<std::string> text = tomlText(differing, problem);
  if (!text) return std::make_error_code(std::errc::result_out_of_range);
  const std::error_code error = replaceFile(stateDirectory_, fileNameOf(domain), *text);
  if (error) problem = stateDirectory_ + "/" + fileNameOf(domain) + ": " + error.message();
  return error;
}

}  // namespace tonewerk
