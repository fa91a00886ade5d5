// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// Why a source of driver channels could not be read: codes of ChanmeterError beside those that Chanmeter
// names itself. docs/driver-channels.md says what publishers do about them.
enum ChannelFailure : std::int64_t {
  kChannelsUnreadable = 2,      // the system refuses, or there is no regular file
  kChannelsTooLarge = 3,        // a file over 1 MiB
  kChannelsNotJson = 4,         //
  kChannelsFieldMissing = 5,    //
  kChannelsWrongType = 6,       // such as a text for a number
  kChannelsOutOfRange = 7,      // an integer that its field cannot hold
  kChannelsUnsettled = 8,       // written to whenever it was read
  kChannelsTooMany = 9,         // past the bound on files, bytes, channels or substreams
  kChannelsNotUnderstood = 10,  // something of the kernel's that has another form than expected
};

}  // namespace tonewerk
