// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

class ChanmeterChannelSet;

// Which channels a reading is for. Refers to what it was made of.
class ChannelChoice {
 public:
  // Those of a group and subgroup, each of them none for all.
  ChannelChoice(const std::optional<std::string>& group, const std::optional<std::string>& subGroup)
      : group_(&group), subGroup_(&subGroup) {}
  // These.
  explicit ChannelChoice(const ChanmeterChannelSet& channels) : channels_(&channels) {}

  bool has(const ChanmeterKey& key) const;
  // Whether any of the driver's may be among them; the driver is none when nobody knows which it is.
  bool concerns(const std::optional<std::string>& driver) const;

 private:
  const std::optional<std::string>* group_ = nullptr;
  const std::optional<std::string>* subGroup_ = nullptr;
  const ChanmeterChannelSet* channels_ = nullptr;
};

}  // namespace tonewerk
