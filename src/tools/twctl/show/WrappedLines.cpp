// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/show/WrappedLines.h"

#include <algorithm>
#include <ostream>

#include "values/PrintableText.h"
#include "values/Utf8.h"

namespace tonewerk {

void WrappedLines::add(const std::string& label, const std::string& text) {
  const std::string shown = printable(text);
  const std::size_t indent = labelWidth_ == 0 ? 0 : labelWidth_ + 2;
  const std::size_t labelSize = utf8Characters(label);
  out_ << label << std::string(indent - std::min(indent, labelSize), ' ');
  std::size_t column = std::max(indent, labelSize);
  bool isFirst = true;
  for (std::size_t at = 0; at < shown.size();) {
    const std::size_t end = std::min(shown.find(' ', at), shown.size());
    if (end == at) {  // texts of the log are aligned with spaces
      ++at;
      continue;
    }
    const std::string word = shown.substr(at, end - at);
    const std::size_t size = utf8Characters(word);
    if (!isFirst && width_ && column + 1 + size > *width_) {
      out_ << '\n' << std::string(indent, ' ');
      column = indent;
    } else if (!isFirst) {
      out_ << ' ';
      ++column;
    }
    out_ << word;
    column += size;
    isFirst = false;
    at = end + 1;
  }
  out_ << '\n';
}

}  // namespace tonewerk
