// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// An identifier of this host for data that is sent to other hosts. It is a keyed hash of the machine
// identifier. So the machine identifier cannot be derived from it, and it cannot be matched with identifiers
// of other programs. 32 hexadecimal digits; empty on a host without a machine identifier.
std::string hostIdentifier();

}  // namespace tonewerk
