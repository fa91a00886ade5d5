// SPDX-License-Identifier: Apache-2.0

// Defines the tracepoints tonewerk:signpost_begin and tonewerk:signpost_end. LTTng's macros include this file
// several times, so it has no ordinary include guard.
#undef LTTNG_UST_TRACEPOINT_PROVIDER
#define LTTNG_UST_TRACEPOINT_PROVIDER tonewerk

#undef LTTNG_UST_TRACEPOINT_INCLUDE
#define LTTNG_UST_TRACEPOINT_INCLUDE "signpost/SignpostTracepoints.h"

#if !defined(TONEWERK_SIGNPOST_TRACEPOINTS_H) || defined(LTTNG_UST_TRACEPOINT_HEADER_MULTI_READ)
#define TONEWERK_SIGNPOST_TRACEPOINTS_H

#include <lttng/tracepoint.h>
#include <stdint.h>

LTTNG_UST_TRACEPOINT_EVENT_CLASS(tonewerk, signpost,
                                 LTTNG_UST_TP_ARGS(const char*, signpostName, uint64_t, signpostIdentifier),
                                 LTTNG_UST_TP_FIELDS(lttng_ust_field_string(name, signpostName)
                                                         lttng_ust_field_integer(uint64_t, identifier,
                                                                                 signpostIdentifier)))

LTTNG_UST_TRACEPOINT_EVENT_INSTANCE(tonewerk, signpost, tonewerk, signpost_begin,
                                    LTTNG_UST_TP_ARGS(const char*, signpostName, uint64_t,
                                                      signpostIdentifier))
LTTNG_UST_TRACEPOINT_EVENT_INSTANCE(tonewerk, signpost, tonewerk, signpost_end,
                                    LTTNG_UST_TP_ARGS(const char*, signpostName, uint64_t,
                                                      signpostIdentifier))

#endif

#include <lttng/tracepoint-event.h>
