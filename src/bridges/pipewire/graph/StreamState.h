// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "bridges/pipewire/graph/AudioFormat.h"

namespace tonewerk {

// Holds what is known about an output stream at one moment. A stream appears in the graph before its client,
// its format and its links.
struct StreamState {
  bool described = false;   // `application` and `role` are final
  std::string application;  // that plays
  std::string role;         // the stream's media role, such as "Music"; may stay empty
  bool running = false;
  std::optional<double> volume;  // 0 to 1, as a mixer shows it
  std::optional<AudioFormat> format;
  // Description of the sink that it plays to, or of several sinks in alphabetical order; empty when there is
  // none.
  std::string device;

  friend bool operator==(const StreamState&, const StreamState&) = default;
};

}  // namespace tonewerk
