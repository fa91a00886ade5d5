// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "values/ValueMap.h"

namespace tonewerk {

// What a page may load and ask.
enum class PageConnections {
  kNone,
  kOwnServer,  // the server that it comes from
};

// Makes the page: one HTML file that needs nothing else. Only the scripts that have `nonce` run, which is a
// text of letters and digits that nobody can guess.
[[nodiscard]] std::string reportPage(const ValueMap& data, std::string_view nonce,
                                     PageConnections connections = PageConnections::kNone);

// A new nonce, from the system's random numbers.
[[nodiscard]] std::string newNonce();

}  // namespace tonewerk
