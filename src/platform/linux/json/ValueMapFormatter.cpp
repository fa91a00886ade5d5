// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/ValueMapFormatter.h"

#include <cstdio>
#include <string>
#include <utility>

#include "values/Utf8.h"

namespace tonewerk {
namespace {

std::string shown(std::string_view bytes) {
  if (isUtf8(bytes)) return std::string(bytes);
  std::string text;
  for (const char c : bytes) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte < 0x80) {
      text += c;
      continue;
    }
    char escape[8];
    std::snprintf(escape, sizeof(escape), "\\x%02x", static_cast<unsigned>(byte));
    text += escape;
  }
  return text;
}

}  // namespace

void ValueMapFormatter::beginObject(std::string_view name) { open_.push_back({name, {}}); }

void ValueMapFormatter::format(std::string_view name, std::uint64_t value) { current().set(name, value); }

void ValueMapFormatter::format(std::string_view name, std::string_view value) {
  current().set(name, shown(value));
}

void ValueMapFormatter::endObject() {
  Open ended = std::move(open_.back());
  open_.pop_back();
  current().set(std::move(ended.name), std::move(ended.map));
}

}  // namespace tonewerk
