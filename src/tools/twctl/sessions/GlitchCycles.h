// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

class JsonService;

// A cycle of the audio graph near a glitch. Times are in microseconds since the glitch's own cycle began.
struct GlitchCycle {
  // What one node did in the cycle. Times are in microseconds since this cycle began.
  struct Node {
    std::string name;
    std::string process;           // empty when it is not known
    double signal = 0.0;           // when it could begin
    std::optional<double> awake;   // when it began; none when it did not
    std::optional<double> finish;  // when it had finished; none when it did not
  };

  double begin = 0.0;
  double period = 0.0;  // how long it had
  std::vector<Node> nodes;

  bool isOfGlitch() const { return begin == 0.0; }
};

// Reads the cycles of a glitch, oldest first. They come from a message, which may say anything: what is no
// cycle and what is no node is left out, and so is everything beyond these limits. Texts are cut.
class GlitchCycles {
 public:
  static constexpr std::size_t kMostCycles = 64;
  static constexpr std::size_t kMostNodes = 64;  // in a cycle
  static constexpr std::size_t kMostCharacters = 100;
  static constexpr double kMostMicroseconds = 1e9;

  // Empty when `text` is not what the view `glitch` describes.
  [[nodiscard]] static std::vector<GlitchCycle> read(std::string_view text, const JsonService& json);
};

}  // namespace tonewerk
