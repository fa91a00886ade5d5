// SPDX-License-Identifier: Apache-2.0
#include "PublishedDrivers.h"

#include <array>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string_view>

namespace tonewerk {
namespace {

// All groups and subgroups that are sampled.
constexpr std::array<std::string_view, 9> kGroups = {R"("group": "OrvaneAE2MCA")",
                                                     R"("group": "Speaker")",
                                                     R"("group": "Amplifier", "subgroup": "MCA")",
                                                     R"("group": "Haptics", "subgroup": "Stats")",
                                                     R"("group": "StateTransitionTimes_ms")",
                                                     R"("group": "Rx")",
                                                     R"("group": "Tx")",
                                                     R"("group": "Amplifier", "subgroup": "Pellan2")",
                                                     R"("group": "pdm")"};

std::string simpleText(std::int64_t value) {
  return R"("unit": "mV", "format": "simple", "value": )" + std::to_string(value);
}

std::string histogramText(std::int64_t hits) {
  std::string text = R"("unit": "us", "format": "histogram", "min": 1, "max": 79, "buckets": [)";
  for (int bucket = 0; bucket < 8; ++bucket) {
    if (bucket > 0) text += ", ";
    text += R"({"lower": )" + std::to_string(bucket * 10) + R"(, "upper": )" +
            std::to_string(bucket * 10 + 10) + R"(, "hits": )" + std::to_string(hits * bucket) + "}";
  }
  return text + "]";
}

std::string statesText(std::int64_t residency) {
  std::string text = R"("unit": "ms", "format": "state", "states": [)";
  for (int state = 0; state < 4; ++state) {
    if (state > 0) text += ", ";
    text += R"({"name": "state )" + std::to_string(state) + R"(", "transitions": )" +
            std::to_string(residency / 7) + R"(, "residency": )" + std::to_string(residency * state) +
            R"(, "duty_cycle": 0.25})";
  }
  return text + "]";
}

std::string channelText(std::size_t channel, std::int64_t time) {
  const std::int64_t value = 100'000 + time * 48 + static_cast<std::int64_t>(channel);
  std::string text = "{" + std::string(kGroups[channel % kGroups.size()]) + R"(, "name": "Counter )" +
                     std::to_string(channel) + R"(", )";
  switch (channel % 4) {
    case 0:
      text += histogramText(value);
      break;
    case 1:
      text += statesText(value);
      break;
    default:
      text += simpleText(value);
  }
  return text + "}";
}

[[noreturn]] void fail(const std::string& path) {
  std::fprintf(stderr, "cannot write %s\n", path.c_str());
  std::exit(2);
}

}  // namespace

void PublishedDrivers::publishNextValues() {
  ++time_;
  bytes_ = 0;
  for (std::size_t driver = 0; driver < drivers_; ++driver) {
    std::string text = R"({"driver": "Driver )" + std::to_string(driver) + R"(<0x1>", "channels": [)";
    for (std::size_t channel = 0; channel < channelsOfEach_; ++channel) {
      if (channel > 0) text += ",\n";
      text += channelText(channel, time_);
    }
    text += "]}\n";
    bytes_ += text.size();
    const std::string path = pathOf(driver);
    const std::string fresh = path + ".new";
    if (!(std::ofstream(fresh) << text << std::flush)) fail(fresh);
    if (std::rename(fresh.c_str(), path.c_str()) != 0) fail(path);
  }
}

std::size_t PublishedDrivers::readFiles() const {
  std::size_t bytes = 0;
  std::string text;
  for (std::size_t driver = 0; driver < drivers_; ++driver) {
    std::ifstream file(pathOf(driver), std::ios::binary);
    text.resize(bytes_);
    file.read(text.data(), static_cast<std::streamsize>(text.size()));
    bytes += static_cast<std::size_t>(file.gcount());
  }
  return bytes;
}

std::string PublishedDrivers::pathOf(std::size_t driver) const {
  return directory_ + "/driver-" + std::to_string(driver) + ".json";
}

}  // namespace tonewerk
