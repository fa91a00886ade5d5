// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "protocol/AudioEvent.h"

namespace tonewerk {

// Convert categories, types and services to texts. Any thread.

// Returns for example "Playback"; with an event domain "HAL_Playback". The "_" stays when the domain has no
// text. An unknown base category is "Undefined".
std::string TWReportingUtilityCategoryString(AudioEventCategory category);
std::string TWReportingUtilityTypeString(AudioEventType type);

std::string TWReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType type);
AudioServiceType TWReportingUtilityGenerateServiceTypeFromServiceName(std::string_view name);

// Returns whether the category has an event domain.
bool TWReportingUtilityIsABTestModeOn(AudioEventCategory category);

}  // namespace tonewerk
