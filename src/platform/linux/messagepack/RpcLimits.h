// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// A frame may be this long and no longer.
inline constexpr std::size_t kMaxFrameBytes = std::size_t{1024} * 1024;

// Arrays and maps inside each other; the frame's own array is the first.
inline constexpr std::size_t kMaxFrameDepth = 32;

// What a connection may have under way before it is no longer read from: requests whose bodies have not run,
// and bytes of those together with the bytes of replies that the peer has not read.
inline constexpr std::size_t kMaxUnfinishedRequests = 1024;
inline constexpr std::size_t kMaxUnfinishedBytes = std::size_t{4} * 1024 * 1024;

}  // namespace tonewerk
