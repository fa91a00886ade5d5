// SPDX-License-Identifier: Apache-2.0
#include "platform/LogLines.h"

namespace tonewerk {
namespace {

thread_local int scopes = 0;

}  // namespace

LogLines::LogLines() { ++scopes; }

LogLines::~LogLines() { --scopes; }

bool LogLines::areKept() { return scopes > 0; }

}  // namespace tonewerk
