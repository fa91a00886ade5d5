// SPDX-License-Identifier: Apache-2.0
#include "c_header.c"
