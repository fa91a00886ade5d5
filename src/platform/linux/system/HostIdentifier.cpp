// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/system/HostIdentifier.h"

#include <systemd/sd-id128.h>

namespace tonewerk {
namespace {

// The key of the hash. If it is changed, every host gets a new identifier.
constexpr sd_id128_t kKey = {
    {0x6f, 0x1d, 0xc8, 0x42, 0x93, 0x5e, 0x4b, 0x07, 0xa6, 0x38, 0xe1, 0x74, 0x2c, 0x9b, 0xd0, 0x55}};

}  // namespace

std::string hostIdentifier() {
  sd_id128_t identifier{};
  if (sd_id128_get_machine_app_specific(kKey, &identifier) < 0) return {};
  char text[SD_ID128_STRING_MAX];
  return sd_id128_to_string(identifier, text);
}

}  // namespace tonewerk
