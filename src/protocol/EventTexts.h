// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

#include "protocol/AudioEvent.h"

namespace tonewerk {

// The texts of categories, types and services. Free functions, any thread.

// "Playback"; with an event domain "HAL_Playback". A domain without a text leaves its "_" standing, a base
// without one reads "Undefined".
std::string TWReportingUtilityCategoryString(AudioEventCategory category);
std::string TWReportingUtilityTypeString(AudioEventType type);

std::string TWReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType type);
AudioServiceType TWReportingUtilityGenerateServiceTypeFromServiceName(std::string_view name);

// Whether the category carries an event domain.
bool TWReportingUtilityIsABTestModeOn(AudioEventCategory category);

}  // namespace tonewerk
