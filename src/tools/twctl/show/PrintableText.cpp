// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/PrintableText.h"

namespace tonewerk {

std::string printable(std::string text) {
  for (std::size_t at = 0; at < text.size(); ++at) {
    const auto byte = static_cast<unsigned char>(text[at]);
    const auto next = at + 1 < text.size() ? static_cast<unsigned char>(text[at + 1]) : 0;
    if (byte == 0xC2 && next >= 0x80 && next < 0xA0) text.replace(at, 2, "?");
    if (byte < ' ' || byte == 0x7F) text[at] = '?';
  }
  return text;
}

}  // namespace tonewerk
