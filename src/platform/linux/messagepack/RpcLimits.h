// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace tonewerk {

// The longest frame.
inline constexpr std::size_t kMaxFrameBytes = std::size_t{1024} * 1024;

// Arrays and maps nested inside each other. The frame's own array is the first.
inline constexpr std::size_t kMaxFrameDepth = 32;

// When a connection reaches one of these, nothing more is read from it: the number of requests whose bodies
// have not run yet, and the bytes of these requests and of the replies that the peer has not read.
inline constexpr std::size_t kMaxUnfinishedRequests = 1024;
inline constexpr std::size_t kMaxUnfinishedBytes = std::size_t{4} * 1024 * 1024;

}  // namespace tonewerk
