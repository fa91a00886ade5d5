// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

namespace tonewerk {

// The form in which a stream hands over its sound.
struct AudioFormat {
  std::string coding;        // "lpcm", else what the sound is packed in: "iec958", "dsd", "mp3"
  std::string sampleFormat;  // "F32LE", "S16LE"; empty where the coding says it all
  std::uint32_t rateHertz = 0;
  std::uint32_t channels = 0;

  // For people and for comparing: "F32LE 48000 Hz 2 ch".
  std::string text() const;

  friend bool operator==(const AudioFormat&, const AudioFormat&) = default;
};

}  // namespace tonewerk
