// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/channels/ChannelChoice.h"

#include <algorithm>

#include "platform/chanmeter/ChanmeterChannelSet.h"

namespace tonewerk {

bool ChannelChoice::includes(const ChanmeterKey& key) const {
  if (channels_ != nullptr) return channels_->contains(key);
  return (!*group_ || key.group == *group_) && (!*subGroup_ || key.subGroup == *subGroup_);
}

bool ChannelChoice::mayInclude(const std::optional<std::string>& driver) const {
  if (channels_ == nullptr) return true;
  if (!driver) return false;
  const auto& keys = channels_->keys();
  // The first key of this driver, if there is one.
  const auto found = std::lower_bound(keys.begin(), keys.end(), ChanmeterKey{.driver = driver});
  return found != keys.end() && found->driver == driver;
}

}  // namespace tonewerk
