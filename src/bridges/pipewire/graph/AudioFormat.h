// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

namespace tonewerk {

// Describes the format of a stream's audio.
struct AudioFormat {
  std::string coding;        // "lpcm", or the encoding: "iec958", "dsd", "mp3"
  std::string sampleFormat;  // "F32LE", "S16LE"; empty for encoded audio
  std::uint32_t rateHertz = 0;
  std::uint32_t channels = 0;

  // Text for people: "F32LE 48000 Hz 2 ch".
  std::string text() const;

  friend bool operator==(const AudioFormat&, const AudioFormat&) = default;
};

}  // namespace tonewerk
