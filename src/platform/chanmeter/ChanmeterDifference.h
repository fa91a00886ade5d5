// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// What changed from `earlier` to `later`, in the order of `later`: the rules are createSamplesDelta()'s. In
// detail:
//   - where something comes several times (a channel, a state's name, a bucket's bounds), the n-th goes with
//     the n-th;
//   - a channel whose format changed is a new one, and so gives nothing; one of a format without values gives
//     itself;
//   - a state or a bucket that was not there before counts from zero, one that is gone is left out;
//   - a change that 64 bits cannot hold is the nearest that they can.
// O(n log n) in the channels, O(n) when both have them in the same order.
ChanmeterRecords chanmeterDifference(const ChanmeterRecords& earlier, const ChanmeterRecords& later);

}  // namespace tonewerk
