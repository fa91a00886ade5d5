// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/CleanText.h"

#include <algorithm>

#include "values/ShortenedText.h"
#include "values/Utf8.h"

namespace tonewerk {

namespace {

bool isControl(char byte) { return static_cast<unsigned char>(byte) < 0x20 || byte == 0x7F; }

}  // namespace

std::string cleanText(std::string_view text) {
  std::string clean = validUtf8(std::string(text));
  clean.resize(shortened(clean, kMaxTextBytes).size());
  std::replace_if(clean.begin(), clean.end(), isControl, '?');
  return clean;
}

}  // namespace tonewerk
