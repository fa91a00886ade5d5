// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// The daemon's trace points: the codes that a tracer sees.
enum class TWReportingTracePoint : std::uint32_t {
  kRequestCreate = 0x21044814,
  kRequestStart = 0x21044818,
  kRequestStop = 0x2104481C,
  kRequestDestroy = 0x21044820,
  kRequestSend = 0x21044824,
  kSessionCreated = 0x21044828,
  kSessionStarted = 0x2104482C,
  kSessionEnding = 0x21044830,
  kSessionReleased = 0x21044834,
  kMessageReceived = 0x21044838,
};

// Emits it through the platform.
void emitTracePoint(TWReportingTracePoint point);

}  // namespace tonewerk
