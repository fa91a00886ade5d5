// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace tonewerk {

// Says why a source of driver channels could not be read. These are codes of ChanmeterError in addition to
// those that Chanmeter defines. docs/driver-channels.md tells publishers how to correct each.
enum ChannelFailure : std::int64_t {
  kChannelsUnreadable = 2,      // the system reports an error, or it is not a regular file
  kChannelsTooLarge = 3,        // the file is larger than 1 MiB
  kChannelsNotJson = 4,         // the text cannot be parsed
  kChannelsFieldMissing = 5,    // a required field is missing
  kChannelsWrongType = 6,       // a field has another type, such as a text for a number
  kChannelsOutOfRange = 7,      // an integer that its field cannot hold
  kChannelsUnsettled = 8,       // the file changed at each attempt to read it
  kChannelsTooMany = 9,         // beyond the limit of files, bytes, channels or substreams
  kChannelsNotUnderstood = 10,  // a file of the kernel has an unexpected form
};

}  // namespace tonewerk
