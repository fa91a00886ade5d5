// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tonewerk {

// Files of the journal's directory: a name is the number of the segment's first record, with 20 digits, and
// one of these.
inline constexpr std::string_view kSegmentEnding = ".segment";
inline constexpr std::string_view kOldSegmentEnding = ".old";  // one that no recovery needs any more

std::string segmentNameOf(std::uint64_t first);
// The number in the name of a segment with this ending; none for other names.
std::optional<std::uint64_t> segmentNumberOf(std::string_view name, std::string_view ending = kSegmentEnding);
// The name that the segment `name` gets when it is old.
std::string oldSegmentNameOf(std::string_view name);

}  // namespace tonewerk
