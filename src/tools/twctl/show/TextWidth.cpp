// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/TextWidth.h"

#include <cwchar>
#include <wchar.h>

#include "values/Utf8.h"

namespace tonewerk {
namespace {

// None when the system does not have it; the locale then stays as it is.
locale_t utf8Locale() {
  static const locale_t locale = ::newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
  return locale;
}

// The columns of the character at the start of `text`, which has `length` bytes there.
std::size_t columnsOf(std::string_view text, std::size_t length) {
  wchar_t character = 0;
  std::mbstate_t state{};
  if (std::mbrtowc(&character, text.data(), length, &state) != length) return 1;
  const int columns = ::wcwidth(character);
  return columns < 0 ? 1 : static_cast<std::size_t>(columns);
}

// The number of bytes at the beginning of `text` that take at most `width` columns.
std::size_t bytesWithin(std::string_view text, std::size_t width) {
  const Utf8Locale locale;
  std::size_t taken = 0;
  for (std::size_t at = 0; at < text.size();) {
    std::size_t length = utf8CharacterLength(text.substr(at));
    if (length == 0) length = 1;
    taken += columnsOf(text.substr(at), length);
    if (taken > width) return at;
    at += length;
  }
  return text.size();
}

}  // namespace

Utf8Locale::Utf8Locale() : before_(::uselocale(utf8Locale())) {}

Utf8Locale::~Utf8Locale() { ::uselocale(before_); }

std::size_t textWidth(std::string_view text) {
  if (isAscii(text)) return text.size();
  const Utf8Locale locale;
  std::size_t width = 0;
  for (std::size_t at = 0; at < text.size();) {
    std::size_t length = utf8CharacterLength(text.substr(at));
    if (length == 0) length = 1;
    width += columnsOf(text.substr(at), length);
    at += length;
  }
  return width;
}

std::string cutToWidth(std::string_view text, std::size_t width) {
  if (text.size() <= width || textWidth(text) <= width) return std::string(text);
  const std::size_t kept = isAscii(text) ? width - 1 : bytesWithin(text, width - 1);
  return std::string(text.substr(0, kept)) + "\u2026";
}

}  // namespace tonewerk
