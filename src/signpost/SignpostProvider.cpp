// SPDX-License-Identifier: Apache-2.0
//
// The library that programs with signposts load if signposts can be traced.

#define LTTNG_UST_TRACEPOINT_CREATE_PROBES
#define LTTNG_UST_TRACEPOINT_DEFINE
#include "signpost/SignpostTracepoints.h"
#include "tonewerk/signpost.h"

namespace {

void begin(const char* name, std::uint64_t identifier) {
  lttng_ust_do_tracepoint(tonewerk, signpost_begin, name, identifier);
}
void end(const char* name, std::uint64_t identifier) {
  lttng_ust_do_tracepoint(tonewerk, signpost_end, name, identifier);
}

}  // namespace

extern "C" {

__attribute__((visibility("default"))) extern const tonewerk::signpost::Provider tonewerk_signpost_provider_0;

const tonewerk::signpost::Provider tonewerk_signpost_provider_0{
    &lttng_ust_tracepoint_tonewerk___signpost_begin.state,
    &lttng_ust_tracepoint_tonewerk___signpost_end.state, &begin, &end};

}  // extern "C"
