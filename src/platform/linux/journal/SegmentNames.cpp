// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/journal/SegmentNames.h"

#include <charconv>
#include <system_error>

namespace tonewerk {
namespace {

constexpr std::size_t kDigits = 20;
// A number that no journal reaches. A file with a larger one is not a segment.
constexpr std::uint64_t kMaxNumber = std::uint64_t{1} << 62;

}  // namespace

std::string segmentNameOf(std::uint64_t first) {
  const std::string number = std::to_string(first);
  return std::string(kDigits - number.size(), '0') + number + std::string(kSegmentEnding);
}

std::optional<std::uint64_t> segmentNumberOf(std::string_view name, std::string_view ending) {
  if (name.size() != kDigits + ending.size() || !name.ends_with(ending)) return std::nullopt;
  std::uint64_t number = 0;
  const char* const end = name.data() + kDigits;
  const auto [parsed, error] = std::from_chars(name.data(), end, number);
  if (error != std::errc() || parsed != end || number == 0 || number > kMaxNumber) return std::nullopt;
  return number;
}

std::string oldSegmentNameOf(std::string_view name) {
  return std::string(name.substr(0, name.rfind('.'))) + std::string(kOldSegmentEnding);
}

}  // namespace tonewerk
