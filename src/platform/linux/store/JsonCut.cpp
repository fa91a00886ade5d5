// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/JsonCut.h"

#include <algorithm>
#include <cstring>
#include <string>

namespace tonewerk {
namespace {

bool isPlain(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

// A number is not the last character of an object.
bool isOfNumber(char c) { return (c >= '0' && c <= '9') || c == '-' || c == '+' || c == '.' || c == 'e'; }

// The key as JSON has it before a value; empty when it has unusual characters. Mostly the same key is asked
// for as the last time.
std::string_view quoted(std::string_view key) {
  thread_local std::string text;
  if (text.size() == key.size() + 3 && text.compare(1, key.size(), key) == 0) return text;
  text.clear();
  if (key.empty() || !std::all_of(key.begin(), key.end(), isPlain)) return text;
  return text.assign(1, '"').append(key).append("\":");
}

std::size_t placeOf(std::string_view wanted, std::string_view text, std::size_t from) {
  const void* found = ::memmem(text.data() + from, text.size() - from, wanted.data(), wanted.size());
  return found == nullptr ? std::string_view::npos
                          : static_cast<std::size_t>(static_cast<const char*>(found) - text.data());
}

}  // namespace

// In a text the quotes are escaped, so a plain key between quotes and before a colon is the key of an entry.
std::optional<JsonCut> cutOfEntry(std::string_view json, const ValueMap& map, std::string_view key) {
  const std::string_view wanted = quoted(key);
  if (wanted.empty()) return std::nullopt;
  const bool isFirst = json.substr(1).starts_with(wanted);
  if (!isFirst && !map.contains(key)) return JsonCut{};
  const std::size_t begin = isFirst ? 1 : placeOf(wanted, json, 0);
  if (begin == std::string_view::npos) return std::nullopt;
  const std::size_t value = begin + wanted.size();
  std::size_t end = value;
  while (isOfNumber(json[end])) ++end;
  if (end == value) return std::nullopt;
  if (isFirst) return JsonCut{begin, end - begin + (json[end] == ',' ? 1 : 0)};
  // The key is there twice when a nested map has it, too.
  if (placeOf(wanted, json, end) != std::string_view::npos) return std::nullopt;
  return JsonCut{begin - 1, end - begin + 1};
}

}  // namespace tonewerk
