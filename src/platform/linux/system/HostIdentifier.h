// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// What tells this host from others in what leaves it: made of the machine's identifier by a keyed hash, so
// that the latter cannot be found out from it and other programs' identifiers cannot be matched with it. 32
// hexadecimal digits; empty on a host without a machine identifier.
std::string hostIdentifier();

}  // namespace tonewerk
