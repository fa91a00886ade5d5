// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <string>

namespace tonewerk {

// Others choose texts that lines, files and terminals show. No byte of them may end a line or steer a
// terminal.
//
// Rules that differ, and why: what goes into JSON, TOML or Markdown is escaped there, and stays whole; the
// tool's printable() takes the control characters of two bytes too, because it alone writes to a terminal.

// One of ASCII: below a space, or DEL.
inline bool isControlCharacter(char byte) { return static_cast<unsigned char>(byte) < ' ' || byte == '\x7F'; }

// `text` with `instead` for each of them.
inline std::string withoutControlCharacters(std::string text, char instead = '?') {
  std::replace_if(text.begin(), text.end(), isControlCharacter, instead);
  return text;
}

// `text` with a '?' for each of them and for each byte beyond ASCII: for what may be cut within a character,
// or is of no known encoding.
inline std::string printableAscii(std::string text) {
  std::replace_if(
      text.begin(), text.end(), [](char byte) { return byte < ' ' || byte > '~'; }, '?');
  return text;
}

}  // namespace tonewerk
