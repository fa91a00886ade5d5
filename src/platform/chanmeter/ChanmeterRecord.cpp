// SPDX-License-Identifier: Apache-2.0
#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

bool ChanmeterRecord::isIn(const std::optional<std::string>& group,
                           const std::optional<std::string>& subGroup) const {
  return (!group || key.group == group) && (!subGroup || key.subGroup == subGroup);
}

}  // namespace tonewerk
