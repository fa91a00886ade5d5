// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <string>

namespace tonewerk {

// Replaces control characters in texts that other programs choose and that are shown in lines, files and
// terminals. No byte of such a text may end a line or control a terminal.
//
// Two places have other rules. Text that goes into JSON, TOML or Markdown is escaped there and loses nothing.
// In the log and in what the tool prints, printable() (values/PrintableText.h) escapes it, together with the
// control characters beyond ASCII.

// True for an ASCII control character: below a space, or DEL.
inline bool isControlCharacter(char byte) { return static_cast<unsigned char>(byte) < ' ' || byte == '\x7F'; }

// Returns `text` with `instead` in place of each control character.
inline std::string withoutControlCharacters(std::string text, char instead = '?') {
  std::replace_if(text.begin(), text.end(), isControlCharacter, instead);
  return text;
}

// Returns `text` with a '?' in place of each control character and each byte beyond ASCII. For text that may
// be cut within a character, or whose encoding is not known.
inline std::string printableAscii(std::string text) {
  std::replace_if(
      text.begin(), text.end(), [](char byte) { return byte < ' ' || byte > '~'; }, '?');
  return text;
}

}  // namespace tonewerk
