// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

namespace tonewerk {

// Makes text that other programs choose safe to show in a log and on a terminal, and loses nothing. These
// characters are escaped, because they end a line, control a terminal, or show the characters around them in
// another order:
//
//   U+0000 to U+001F, U+007F to U+009F       control characters, line feed and escape among them
//   U+2028, U+2029                           line and paragraph separator
//   U+061C, U+200E, U+200F, U+202A to U+202E, U+2066 to U+2069
//                                            the direction of writing
//
// The escapes are those of JSON: "\n", "\r" and "\t", else "\u001b". So JSON stays the same JSON. Backslashes
// stay as they are, so it does not matter how often a text is escaped. Bytes that are not UTF-8 become
// U+FFFD.

// Returns whether printable() would change nothing. Quick for ASCII.
bool isPrintable(std::string_view text);

std::string printable(std::string text);

// The same, but line feeds stay.
std::string printableLines(std::string text);

}  // namespace tonewerk
