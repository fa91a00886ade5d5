// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "protocol/RequestSet.h"
#include "tonewerk/reporting.h"

namespace tonewerk {

// A request and a notification differ only in how they begin. What follows, the method and its parameters, is
// a body here; which of the two it becomes is only known when it is sent.

// The longest beginning: an array, the kind and a message identifier.
inline constexpr std::size_t kFrameHeadBytes = 7;
// A notification's: an array of three and its kind.
inline constexpr std::size_t kNotificationHeadBytes = 2;

void appendFrameHead(std::string& out, std::optional<std::uint32_t> requestIdentifier);

void appendRequestBody(std::string& out, std::string_view method, const Arguments& arguments);
// With a list payload for parameters; null for none.
void appendRequestBody(std::string& out, std::string_view method, const twr_payload* parameters);

// A payload's entries as a map; none when they are not what the protocol carries, which only happens when
// somebody else wrote into the payload's memory.
std::optional<ValueMap> mapOf(const twr_payload& payload);

}  // namespace tonewerk
