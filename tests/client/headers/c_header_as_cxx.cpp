// SPDX-License-Identifier: Apache-2.0
#include "c_header.c"  // NOLINT(bugprone-suspicious-include): that is what is tested
