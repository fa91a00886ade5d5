// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "platform/chanmeter/ChanmeterRecord.h"

namespace tonewerk {

class ChanmeterChannelSet;

// Selects the channels to be read. It keeps references to the constructor's arguments, which must outlive it.
class ChannelChoice {
 public:
  // Selects the channels of a group and a subgroup. None stands for all groups or subgroups.
  ChannelChoice(const std::optional<std::string>& group, const std::optional<std::string>& subGroup)
      : group_(&group), subGroup_(&subGroup) {}
  // Selects these channels.
  explicit ChannelChoice(const ChanmeterChannelSet& channels) : channels_(&channels) {}

  bool includes(const ChanmeterKey& key) const;
  // Whether channels of this driver may be selected. Pass none if the driver is not known; that is then true
  // only for a choice by group.
  bool mayInclude(const std::optional<std::string>& driver) const;

 private:
  const std::optional<std::string>* group_ = nullptr;
  const std::optional<std::string>* subGroup_ = nullptr;
  const ChanmeterChannelSet* channels_ = nullptr;
};

}  // namespace tonewerk
