// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

// Returns everything that people can see in the store in `directory`, as text to compare: the analytics
// events in the order of their recording, then the metrics, the power events and the real-time-communication
// sessions with their messages. Identifiers are left out, so that a row more or less changes no others. An
// event with two names is one entry. Empty when there is no store.
std::string storeText(const std::string& directory);

}  // namespace tonewerk
