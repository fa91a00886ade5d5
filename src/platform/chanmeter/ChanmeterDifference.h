// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

// Returns what changed from `earlier` to `later`, in the order of `later`, by the rules of
// createSamplesDelta(). In detail:
// - Where something occurs several times (a channel, a state's name, a bucket's bounds), the n-th in `later`
//   is compared with the n-th in `earlier`.
// - A channel whose format changed counts as new and gives nothing. A channel of a format without values
//   gives itself.
// - A new state or bucket counts from zero; one that is gone is left out.
// - A change that 64 bits cannot hold becomes the nearest number that they can hold.
// O(n log n) in the channels; O(n) when both have them in the same order.
ChanmeterRecords chanmeterDifference(const ChanmeterRecords& earlier, const ChanmeterRecords& later);

}  // namespace tonewerk
