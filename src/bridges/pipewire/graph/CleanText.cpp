// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/CleanText.h"

#include <utility>

#include "values/ControlCharacters.h"
#include "values/ShortenedText.h"
#include "values/Utf8.h"

namespace tonewerk {

std::string cleanText(std::string_view text) {
  std::string clean = validUtf8(std::string(text));
  clean.resize(shortened(clean, kMaxTextBytes).size());
  return withoutControlCharacters(std::move(clean));
}

}  // namespace tonewerk
