// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <locale.h>
#include <string>
#include <string_view>

namespace tonewerk {

// While it exists, the C library takes texts of this thread for UTF-8, whatever the caller's locale says, as
// all texts of this project are.
class Utf8Locale {
 public:
  Utf8Locale();
  Utf8Locale(const Utf8Locale&) = delete;
  Utf8Locale& operator=(const Utf8Locale&) = delete;
  ~Utf8Locale();

 private:
  const locale_t before_;
};

// How many columns of a terminal `text` takes, which is UTF-8: two for a wide character, none for one that
// combines with the one before it.
std::size_t textWidth(std::string_view text);

// `text` in at most `width` columns, from 1 on; "…" is the last one of what was longer.
std::string cutToWidth(std::string_view text, std::size_t width);

}  // namespace tonewerk
