// SPDX-License-Identifier: Apache-2.0
#include "support/memory/MemoryPreferenceStore.h"

#include <functional>
#include <limits>

namespace tonewerk {
namespace {

bool isDomain(std::string_view domain) {
  return !domain.empty() && domain.front() != '.' && domain.find('/') == std::string_view::npos &&
         domain.find('\0') == std::string_view::npos;
}

// The file format of the real store has only signed integers.
bool canBeStored(const Value& value) {
  if (const auto* number = value.asUnsigned()) {
    return *number <= static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  }
  if (const auto* array = value.asArray()) {
    for (const Value& element : *array) {
      if (!canBeStored(element)) return false;
    }
  }
  if (const auto* map = value.asMap()) {
    for (const ValueMap::Entry& entry : *map) {
      if (!canBeStored(entry.value)) return false;
    }
  }
  return true;
}

std::error_code failed(std::errc error, std::string_view words, std::string* problem) {
  if (problem != nullptr) *problem = words;
  return std::make_error_code(error);
}

bool same(const Value* a, const Value& b) { return a != nullptr && a->kind() == b.kind() && *a == b; }

}  // namespace

const MemoryPreferenceStore::Domain* MemoryPreferenceStore::find(std::string_view domain) const {
  const auto found = domains_.find(domain);
  return found == domains_.end() ? nullptr : &found->second;
}

std::optional<Value> MemoryPreferenceStore::read(std::string_view domain, std::string_view key) const {
  const ValueMap all = readAll(domain);
  const Value* value = all.find(key);
  return value == nullptr ? std::nullopt : std::optional(*value);
}

ValueMap MemoryPreferenceStore::readAll(std::string_view domain) const {
  const MutexLock lock(mutex_);
  const Domain* held = find(domain);
  if (held == nullptr) return {};
  ValueMap all = held->configured;
  all.merge(held->written);
  return all;
}

std::error_code MemoryPreferenceStore::checkWrite(std::string_view domain, std::string* problem) const {
  if (!isDomain(domain)) return failed(std::errc::invalid_argument, "no name of a domain", problem);
  if (failure_ != std::errc()) return failed(failure_, std::make_error_code(failure_).message(), problem);
  return {};
}

std::error_code MemoryPreferenceStore::write(std::string_view domain, std::string_view key,
                                             const Value& value, std::string* problem) {
  const MutexLock lock(mutex_);
  if (const std::error_code error = checkWrite(domain, problem)) return error;
  if (!canBeStored(value)) {
    return failed(std::errc::result_out_of_range, "an integer above 9223372036854775807", problem);
  }
  Domain& held = domains_[std::string(domain)];
  if (same(held.configured.find(key), value)) {
    held.written.erase(key);
  } else {
    held.written.set(key, value);
  }
  return {};
}

std::error_code MemoryPreferenceStore::remove(std::string_view domain, std::string_view key,
                                              std::string* problem) {
  const MutexLock lock(mutex_);
  if (const std::error_code error = checkWrite(domain, problem)) return error;
  const auto held = domains_.find(domain);
  if (held != domains_.end() && held->second.written.erase(key)) return {};
  if (held != domains_.end() && held->second.configured.contains(key)) {
    return failed(std::errc::operation_not_permitted, "only the configuration holds the key", problem);
  }
  return failed(std::errc::no_such_file_or_directory, "no such key", problem);
}

void MemoryPreferenceStore::configure(std::string_view domain, std::string_view key, const Value& value) {
  const MutexLock lock(mutex_);
  domains_[std::string(domain)].configured.set(key, value);
}

void MemoryPreferenceStore::failWrites(std::errc error) {
  const MutexLock lock(mutex_);
  failure_ = error;
}

ValueMap MemoryPreferenceStore::written(std::string_view domain) const {
  const MutexLock lock(mutex_);
  const Domain* held = find(domain);
  return held == nullptr ? ValueMap() : held->written;
}

}  // namespace tonewerk
