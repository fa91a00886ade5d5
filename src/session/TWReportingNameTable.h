// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <unordered_map>
#include <vector>

#include "platform/Metricon.h"
#include "protocol/AudioEvent.h"
#include "values/SharedString.h"

namespace tonewerk {

// Composes names from a message's category and type and a session's service. Each name is composed once.
//
// The table's size is bounded, whatever clients send: categories, types and services that have no text of
// their own share one place. Used on the work queue.
class TWReportingNameTable {
 public:
  TWReportingNameTable();

  // The category's text followed by the type's, such as "PlaybackStart".
  const SharedString& audioTag(AudioEventCategory category, AudioEventType type);

  // "com.orvane.tonewerk.<category>.<type>", then "com.orvane.<service>.<category>.<type>".
  const EventNames& eventNames(AudioEventCategory category, AudioEventType type, AudioServiceType service);

 private:
  std::vector<SharedString> audioTags_;
  std::unordered_map<std::size_t, EventNames> eventNames_;
};

}  // namespace tonewerk
