// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/PrintableText.h"

#include <cstddef>
#include <utility>

#include "values/ControlCharacters.h"

namespace tonewerk {

std::string printable(std::string text) {
  for (std::size_t at = 0; at + 1 < text.size(); ++at) {
    const auto next = static_cast<unsigned char>(text[at + 1]);
    if (text[at] == '\xC2' && next >= 0x80 && next < 0xA0) text.replace(at, 2, "?");
  }
  return withoutControlCharacters(std::move(text));
}

}  // namespace tonewerk
