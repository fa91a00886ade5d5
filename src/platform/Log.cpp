// SPDX-License-Identifier: Apache-2.0
#include "platform/Log.h"

#include <algorithm>
#include <array>
#include <cassert>
#include <charconv>
#include <cstdio>

namespace tonewerk {
namespace {

std::string_view baseName(std::string_view file) {
  const std::size_t slash = file.rfind('/');
  if (slash != std::string_view::npos) file.remove_prefix(slash + 1);
  return file.substr(0, file.rfind('.'));
}

}  // namespace

std::string_view textOf(LogLevel level) {
  switch (level) {
    case LogLevel::kDebug:
      return "debug";
    case LogLevel::kInfo:
      return "info";
    case LogLevel::kDefault:
      return "default";
    case LogLevel::kError:
      return "error";
  }
  return "default";
}

void appendLogNumber(std::string& out, double number, char conversion) {
  if (conversion != 'f') {
    out += textOf(number);
    return;
  }
  char text[352];  // the longest double has 309 digits before the point
  std::snprintf(text, sizeof(text), "%f", number);
  out += text;
}

std::string logPrefix(std::string_view file, int line) {
  constexpr std::size_t kNameWidth = 25;
  constexpr std::size_t kLineWidth = 5;
  const std::string_view name = baseName(file);
  std::array<char, 16> digits{};
  const char* const end = std::to_chars(digits.data(), digits.data() + digits.size(), line).ptr;
  const auto size = static_cast<std::size_t>(end - digits.data());
  std::string text;
  text.reserve(160);  // a usual message, too
  text.append(kNameWidth - std::min(kNameWidth, name.size()), ' ');
  text += name;
  text += ':';
  text.append(digits.data(), size);
  text.append(kLineWidth - std::min(kLineWidth, size) + 1, ' ');
  return text;
}

void log_detail::write(LogLevel level, const LogSite& site, std::string_view format,
                       std::span<const Argument> arguments) {
  std::string message = logPrefix(site.file, site.line);
  auto argument = arguments.begin();
  while (!format.empty()) {
    const std::size_t percent = format.find('%');
    const bool isLast = percent == std::string_view::npos || percent + 1 == format.size();
    message += isLast ? format : format.substr(0, percent);
    if (isLast) break;
    std::size_t at = percent + 1;
    if (format[at] == '%') {
      message += '%';
    } else {
      while (isLengthModifier(format[at])) ++at;
      assert(argument != arguments.end());
      argument->append(message, argument->object, format[at]);
      ++argument;
    }
    format.remove_prefix(at + 1);
  }
  site.category->write(level, message);
}

}  // namespace tonewerk
