// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tonewerk {

// Whether this program, and the daemon built with it, uses a sanitizer's allocator, which does not return
// memory.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
inline constexpr bool kHasSanitizer = true;
#elif defined(__has_feature)
inline constexpr bool kHasSanitizer = __has_feature(address_sanitizer) || __has_feature(thread_sanitizer);
#else
inline constexpr bool kHasSanitizer = false;
#endif

}  // namespace tonewerk
