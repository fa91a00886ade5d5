// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "bridges/pipewire/graph/AudioFormat.h"

namespace tonewerk {

// What is known of an output stream at one moment. Knowledge arrives in pieces: a stream is in the graph
// before its owner, its format or its links are.
struct StreamState {
  bool described = false;   // `application` and `role` are all that will come
  std::string application;  // who plays
  std::string role;         // the stream's media role, as "Music"; may stay empty
  bool running = false;
  std::optional<double> volume;  // 0 to 1 as a mixer shows it
  std::optional<AudioFormat> format;
  std::string
      device;  // description of the sink it plays to, or of several in alphabetical order; empty when none

  friend bool operator==(const StreamState&, const StreamState&) = default;
};

}  // namespace tonewerk
