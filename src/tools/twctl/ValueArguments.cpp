// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/ValueArguments.h"

#include <charconv>
#include <cmath>
#include <system_error>

#include "session/TWReportingUtility.h"

namespace tonewerk {
namespace {

// Base categories and types lie well below this.
constexpr std::uint16_t kNamesEnd = 256;
constexpr int kDomainBits = 16;

template <typename Number>
std::optional<Number> wholeNumber(std::string_view text) {
  Number number{};
  const char* end = text.data() + text.size();
  const auto [rest, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || rest != end) return std::nullopt;
  return number;
}

// The base category with this name.
std::optional<AudioEventCategory> baseCategory(std::string_view name) {
  const std::string undefined = TWReportingUtilityCategoryString(0);
  for (AudioEventCategory base = 1; base < kNamesEnd; ++base) {
    const std::string text = TWReportingUtilityCategoryString(base);
    if (text != undefined && text == name) return base;
  }
  return std::nullopt;
}

}  // namespace

Value valueOfArgument(std::string_view text) {
  if (text == "true") return true;
  if (text == "false") return false;
  if (const auto integer = wholeNumber<std::int64_t>(text)) return *integer;
  if (const auto integer = wholeNumber<std::uint64_t>(text)) return *integer;
  // "inf" and "nan" are read as numbers too, but nobody who types them means that.
  if (const auto number = wholeNumber<double>(text); number && std::isfinite(*number)) return *number;
  return text;
}

std::optional<ValueMapEntry> entryOfArgument(std::string_view text) {
  const std::size_t equals = text.find('=');
  if (equals == std::string_view::npos || equals == 0) return std::nullopt;
  return ValueMapEntry{text.substr(0, equals), valueOfArgument(text.substr(equals + 1))};
}

std::optional<AudioEventCategory> categoryOfArgument(std::string_view text) {
  if (const auto number = wholeNumber<AudioEventCategory>(text)) return number;
  if (text == "Unknown") return kCategoryUnknown;
  if (const auto base = baseCategory(text)) return base;
  // A domain is one bit of the upper half, and shows before the base's name.
  const std::size_t underscore = text.find('_');
  if (underscore == std::string_view::npos || underscore == 0) return std::nullopt;
  const auto base = baseCategory(text.substr(underscore + 1));
  if (!base) return std::nullopt;
  for (int bit = 0; bit < kDomainBits; ++bit) {
    const AudioEventCategory category = *base | AudioEventCategory{0x10000} << bit;
    if (TWReportingUtilityCategoryString(category) == text) return category;
  }
  return std::nullopt;
}

std::optional<AudioEventType> typeOfArgument(std::string_view text) {
  if (const auto number = wholeNumber<AudioEventType>(text)) return number;
  if (text == "Unknown") return kTypeUnknown;
  for (AudioEventType type = 0; type < kNamesEnd; ++type) {
    if (TWReportingUtilityTypeString(type) == text) return type;
  }
  return std::nullopt;
}

std::string problemWithReporterID(const std::string& text) {
  ReporterID reporterID = 0;
  const char* end = text.data() + text.size();
  const auto [rest, error] = std::from_chars(text.data(), end, reporterID);
  return error == std::errc() && rest == end ? "" : "\"" + text + "\" is no signed 64-bit number";
}

}  // namespace tonewerk
