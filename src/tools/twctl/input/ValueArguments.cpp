// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/input/ValueArguments.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <system_error>
#include <utility>
#include <vector>

#include "protocol/EventTexts.h"
#include "tools/twctl/input/Suggestion.h"
#include "values/ClosestName.h"

namespace tonewerk {
namespace {

// Base categories and types lie well below this.
constexpr std::uint16_t kNamesEnd = 256;
constexpr int kDomainBits = 16;
constexpr double kLeastSeconds = 0.05;
constexpr double kMaxSeconds = 86400;

template <typename Number>
std::optional<Number> numberOf(std::string_view text) {
  Number number{};
  const char* end = text.data() + text.size();
  const auto [rest, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || rest != end) return std::nullopt;
  return number;
}

// A number and its name.
template <typename Number>
struct Named {
  std::string name;
  Number number;
};

const std::vector<Named<AudioEventCategory>>& baseCategories() {
  static const auto categories = [] {
    std::vector<Named<AudioEventCategory>> named;
    const std::string undefined = TWReportingUtilityCategoryString(0);
    for (AudioEventCategory base = 1; base < kNamesEnd; ++base) {
      std::string name = TWReportingUtilityCategoryString(base);
      if (name != undefined) named.push_back({std::move(name), base});
    }
    return named;
  }();
  return categories;
}

// A domain is one bit of the upper half. Its name precedes the base's name.
const std::vector<Named<AudioEventCategory>>& categoriesOfDomains() {
  static const auto categories = [] {
    std::vector<Named<AudioEventCategory>> named;
    for (int bit = 0; bit < kDomainBits; ++bit) {
      for (const auto& base : baseCategories()) {
        const AudioEventCategory category = base.number | AudioEventCategory{0x10000} << bit;
        std::string name = TWReportingUtilityCategoryString(category);
        if (name != base.name && name.front() != '_') named.push_back({std::move(name), category});
      }
    }
    return named;
  }();
  return categories;
}

const std::vector<Named<AudioEventType>>& types() {
  static const auto all = [] {
    std::vector<Named<AudioEventType>> named;
    // A type without a name has the text of type 0.
    for (AudioEventType type = 0; type < kNamesEnd; ++type) {
      std::string name = TWReportingUtilityTypeString(type);
      if (named.empty() || name != named.front().name) named.push_back({std::move(name), type});
    }
    return named;
  }();
  return all;
}

template <typename Number>
std::optional<Number> numberNamed(const std::vector<Named<Number>>& all, std::string_view name) {
  for (const Named<Number>& named : all) {
    if (named.name == name) return named.number;
  }
  return std::nullopt;
}

template <typename Number>
std::vector<std::string> namesOf(const std::vector<Named<Number>>& all) {
  std::vector<std::string> names;
  names.reserve(all.size());
  for (const Named<Number>& named : all) names.push_back(named.name);
  return names;
}

}  // namespace

Value valueOfArgument(std::string_view text) {
  if (text == "true") return true;
  if (text == "false") return false;
  if (const auto integer = numberOf<std::int64_t>(text)) return *integer;
  if (const auto integer = numberOf<std::uint64_t>(text)) return *integer;
  // "inf" and "nan" would be read as numbers, but people who type them mean texts.
  if (const auto number = numberOf<double>(text); number && std::isfinite(*number)) return *number;
  return text;
}

std::optional<ValueMapEntry> entryOfArgument(std::string_view text) {
  const std::size_t equals = text.find('=');
  if (equals == std::string_view::npos || equals == 0) return std::nullopt;
  return ValueMapEntry{text.substr(0, equals), valueOfArgument(text.substr(equals + 1))};
}

std::optional<AudioEventCategory> categoryOfArgument(std::string_view text) {
  if (const auto number = numberOf<AudioEventCategory>(text)) return number;
  if (text == "Unknown") return kCategoryUnknown;
  const auto base = numberNamed(baseCategories(), text);
  return base ? base : numberNamed(categoriesOfDomains(), text);
}

std::optional<AudioEventType> typeOfArgument(std::string_view text) {
  if (const auto number = numberOf<AudioEventType>(text)) return number;
  if (text == "Unknown") return kTypeUnknown;
  return numberNamed(types(), text);
}

std::vector<std::string> baseCategoryNames() { return namesOf(baseCategories()); }

std::vector<std::string> categoryNames() {
  std::vector<std::string> names = baseCategoryNames();
  for (std::string& name : namesOf(categoriesOfDomains())) names.push_back(std::move(name));
  return names;
}

std::vector<std::string> typeNames() { return namesOf(types()); }

std::string unknownCategory(std::string_view text) {
  const std::string listed = thereAre(baseCategoryNames());  // too many have a domain to list them all
  const std::optional<std::string> meant = closestTo(text, categoryNames());
  return "there is no category '" + std::string(text) + "'; " + (meant ? didYouMean(*meant) : listed);
}

std::string unknownType(std::string_view text) {
  return "there is no type '" + std::string(text) + "'; " + hintFor(text, typeNames());
}

std::string problemWithService(const std::string& pattern) {
  if (pattern.find_first_of("*?[") != std::string::npos) return "";
  std::vector<std::string> names;
  const std::string unknown = TWReportingUtilityGenerateServiceNameFromServiceType(kServiceUnknown);
  for (AudioServiceType type = 0; type < kNamesEnd; ++type) {
    std::string name = TWReportingUtilityGenerateServiceNameFromServiceType(type);
    if (name != unknown) names.push_back(std::move(name));
  }
  if (pattern == unknown || std::find(names.begin(), names.end(), pattern) != names.end()) return "";
  return "there is no service '" + pattern + "'; " + hintFor(pattern, names);
}

std::string problemWithReporterID(const std::string& text) {
  return numberOf<ReporterID>(text) ? "" : "\"" + text + "\" is no signed 64-bit number";
}

std::string problemWithCount(const std::string& text) {
  const auto count = numberOf<std::int64_t>(text);
  return count && *count >= 1 ? "" : "\"" + text + "\" is no whole number from 1";
}

std::string problemWithSeconds(const std::string& text) {
  const auto seconds = numberOf<double>(text);
  const bool isWithin = seconds && *seconds >= kLeastSeconds && *seconds <= kMaxSeconds;
  return isWithin ? "" : "\"" + text + "\" is no number of seconds from 0.05 to 86400";
}

}  // namespace tonewerk
